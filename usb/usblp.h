// Requests of the usblp driver, as the appliance's kernel numbers them.
#pragma once

#include <linux/ioctl.h>

#include <cstdint>

namespace xavo {

// The driver fills this many bytes with the device ID reply: two length
// bytes, most significant first, then the text.
inline constexpr int kUsblpDeviceIdSize = 4095;

inline constexpr std::uint32_t kLpiocGetDeviceId = 0x8FFF5001u;
inline constexpr std::uint32_t kLpiocSoftReset = 0x5009u;
// The appliance driver's own requests, sent when a printer comes and goes.
inline constexpr std::uint32_t kLpiocEnable = 0x40005008u;
inline constexpr std::uint32_t kLpiocDisable = 0x40005007u;

static_assert(kLpiocGetDeviceId == _IOC(_IOC_READ, 'P', 1, kUsblpDeviceIdSize));
static_assert(kLpiocSoftReset == _IOC(_IOC_NONE, 'P', 9, 0));
static_assert(kLpiocEnable == _IOC(_IOC_WRITE, 'P', 8, 0));
static_assert(kLpiocDisable == _IOC(_IOC_WRITE, 'P', 7, 0));

// Retries of a busy device when the device ID is read or the device reset.
inline constexpr std::int32_t kUsblpOpenRetries = 8;

}  // namespace xavo
