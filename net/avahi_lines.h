// The resolved-service lines of "avahi-browse -arpt":
//     =;eth0;IPv4;Office\032Laser;_pdl-datastream._tcp;local;laser.local;192.168.1.5;9100;"usb_MFG=ACME" "usb_MDL=Laser 100"
// fields separated by ";", the address a field of its own, the port the
// last field but one and the TXT record (quoted key=value strings) last.
#pragma once

#include <optional>
#include <string_view>

namespace xavo {

// The printing services a printer may announce, in the order they are
// preferred: BJNP, raw socket, LPD, IPP.
enum AvahiService : int { kAvahiBjnp = 0, kAvahiSocket, kAvahiLpd, kAvahiIpp, kAvahiServiceCount };

// The service a port field stands for (read as a decimal number, as atoi
// reads it), or nullopt for any other port.
std::optional<AvahiService> AvahiServiceForPort(std::string_view portField);

// The CUPS backend name of a service.
const char *AvahiBackendName(AvahiService service);

// The value of key ("usb_MDL=") in a TXT record: from behind the key to
// the next double quote, or to the end of the record when the quote is
// missing.  nullopt when the key is absent.
std::optional<std::string_view> AvahiTxtValue(std::string_view txt, std::string_view key);

}  // namespace xavo
