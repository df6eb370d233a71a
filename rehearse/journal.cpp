// SPDX-License-Identifier: MIT
#include "journal.h"

#include "owner.h"
#include "places.h"
#include "text.h"

#include <cstring>
#include <string>
#include <string_view>
#include <sys/socket.h>
#include <sys/un.h>

namespace
{

bool AllSend(int fd, std::string_view message)
{
    while (!message.empty()) {
        const ssize_t cb = send(fd, message.data(), message.size(), MSG_NOSIGNAL);
        if (cb <= 0) {
            return false;
        }
        message.remove_prefix(static_cast<size_t>(cb));
    }
    return true;
}

} // namespace

bool JournalSend(const JOURNAL_HEAD &head, const WORDS &argv)
{
    std::string szMessage(reinterpret_cast<const char *>(&head), sizeof(head));
    for (const std::string &szWord : argv) {
        szMessage.append(szWord.c_str(), szWord.size() + 1);
    }
    struct sockaddr_un address = {};
    address.sun_family = AF_UNIX;
    memcpy(address.sun_path, JOURNAL_PATH, sizeof(JOURNAL_PATH));
    const DESCRIPTOR wire(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
    char kept = 0;
    return wire.fd >= 0 &&
           connect(wire.fd, reinterpret_cast<const struct sockaddr *>(&address), sizeof(address)) ==
               0 &&
           AllSend(wire.fd, szMessage) && shutdown(wire.fd, SHUT_WR) == 0 &&
           read(wire.fd, &kept, 1) == 1;
}

bool JournalParse(std::string_view message, JOURNAL_HEAD *pHead, WORDS *pArgv)
{
    if (message.size() < sizeof(*pHead)) {
        return false;
    }
    memcpy(pHead, message.data(), sizeof(*pHead));
    message.remove_prefix(sizeof(*pHead));
    while (!message.empty()) {
        const size_t cb = message.find('\0');
        if (cb == std::string_view::npos) {
            return false;
        }
        pArgv->emplace_back(message.substr(0, cb));
        message.remove_prefix(cb + 1);
    }
    return true;
}
