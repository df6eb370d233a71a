// SPDX-License-Identifier: MIT
#include "md_answer.h"
#include "md_health.h"

#include <cstdint>
#include <cstdio>
#include <cstring>
#include <sys/sysmacros.h>

namespace
{

// Looked up by device number, so that partitionable and named arrays are found as well.
constexpr const char *MD_DIR_FORMAT = "/sys/dev/block/%u:%u/md";

template <typename T>
void AnswerFill(const T &data, MD_ANSWER *pAnswer)
{
    static_assert(sizeof(data) <= sizeof(pAnswer->data));
    memcpy(pAnswer->data, &data, sizeof(data));
    pAnswer->cb = sizeof(data);
}

} // namespace

int MdAnswerGet(dev_t device, std::uint32_t request, MD_ANSWER *pAnswer)
{
    char szMdDir[64];
    MD_ATTRIBUTES attributes;

    (void)snprintf(szMdDir, sizeof(szMdDir), MD_DIR_FORMAT, major(device), minor(device));
    if (MdAttributesRead(szMdDir, &attributes) != 0) {
        return major(device) == MD_MAJOR ? -1 : 0;
    }
    if (!MdIsRunning(&attributes)) {
        return -1;
    }
    if (request == MD_GET_ARRAY_STATUS) {
        AnswerFill(MdHealthGet(&attributes), pAnswer);
    } else {
        AnswerFill(MdSyncStatusGet(&attributes), pAnswer);
    }
    return 1;
}
