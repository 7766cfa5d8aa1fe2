// ping's summary line, as iputils prints it:
//     1 packets transmitted, 1 received, 0% packet loss, time 0ms
//     2 packets transmitted, 0 received, +2 errors, 100% packet loss, time 1001ms
#pragma once

#include <optional>
#include <string_view>

namespace xavo {

// nullopt for a line that is not the summary ("packet loss" absent);
// otherwise whether the loss stated was other than exactly 100 percent.
std::optional<bool> PingSummaryReachable(std::string_view line);

}  // namespace xavo
