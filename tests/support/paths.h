// The files the library keeps, where every suite sets them up and reads
// them back.
#pragma once

namespace xavo::test {

inline constexpr char kConf[] = "/usr/xavo/etc/printer.conf";
inline constexpr char kNptab[] = "/usr/xavo/etc/nptab";
inline constexpr char kUsbtab[] = "/tmp/usbtab";
inline constexpr char kSmbConf[] = "/etc/samba/smb.reserved.conf";
inline constexpr char kCupsConf[] = "/etc/cups/printers.conf";

}  // namespace xavo::test
