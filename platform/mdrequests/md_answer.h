// SPDX-License-Identifier: MIT
#pragma once

// The two requests that the appliance's md driver has in addition to those of the stock one, and
// what it would answer for a device. Independent of who asks, and how.

#include "md_health.h"

#include <cstddef>
#include <cstdint>
#include <linux/major.h>
#include <sys/ioctl.h>
#include <sys/types.h>

static_assert(sizeof(MD_SYNC_STATUS) == 24, "three 64-bit words without gaps, on every platform");

constexpr std::uint32_t MD_GET_SYNC_STATUS = _IOR(MD_MAJOR, 0x60, MD_SYNC_STATUS);
constexpr std::uint32_t MD_GET_ARRAY_STATUS = _IOR(MD_MAJOR, 0x61, std::int32_t);

struct MD_ANSWER {
    unsigned char data[sizeof(MD_SYNC_STATUS)];
    std::size_t cb; // how many bytes of data are used
};

// What the driver answers to one of the two requests on a block device. Returns 1 with the answer
// filled in, 0 when the device is not an md array and the request not for the md driver, -1 when it
// is an md array that is not running: the driver then fails with ENODEV.
int MdAnswerGet(dev_t device, std::uint32_t request, MD_ANSWER *pAnswer);
