// The Samba share file and its printer share.
#pragma once

namespace xavo {

inline constexpr char kSmbReservedConfPath[] = "/etc/samba/smb.reserved.conf";
inline constexpr char kSmbPrintersSection[] = "printers";
inline constexpr char kSmbLineFormat[] = "\t%s = %s\n";

}  // namespace xavo
