#include "net/ping_lines.h"

namespace xavo {

namespace {

constexpr std::string_view kSummaryMark = "packet loss";
constexpr unsigned kTotalLoss = 100;

std::string_view SkipBlanks(std::string_view text) {
    size_t i = 0;
    while (i < text.size() && (text[i] == ' ' || text[i] == '\t')) ++i;
    return text.substr(i);
}

// The unsigned decimal number at the start of text (after blanks); 0 when
// there is none, the way the summary's reader has always read it.
unsigned LeadingNumber(std::string_view text) {
    text = SkipBlanks(text);
    unsigned long value = 0;
    for (char ch : text) {
        if (ch < '0' || ch > '9') break;
        value = value * 10 + static_cast<unsigned>(ch - '0');
        if (value > 0xFFFFFFFFul) return 0xFFFFFFFFu;  // not 100 either way
    }
    return static_cast<unsigned>(value);
}

}  // namespace

std::optional<bool> PingSummaryReachable(std::string_view line) {
    if (line.find(kSummaryMark) == std::string_view::npos) return std::nullopt;
    size_t first = line.find(',');
    if (first == std::string_view::npos) return false;
    size_t second = line.find(',', first + 1);
    if (second == std::string_view::npos) return false;
    std::string_view loss = line.substr(second + 1);
    // iputils puts its counters of duplicates, corrupted replies and errors
    // ("+2 errors") between the received count and the loss when there are
    // any; each begins with "+".  An unreachable printer on the LAN shows
    // "+N errors" there, and reading that field as the loss would call it
    // Online.  The loss is the first field from the third on that is not
    // such a counter.
    while (SkipBlanks(loss).starts_with('+')) {
        size_t comma = loss.find(',');
        if (comma == std::string_view::npos) break;
        loss = loss.substr(comma + 1);
    }
    size_t percent = loss.find('%');
    if (percent != std::string_view::npos) loss = loss.substr(0, percent);
    return LeadingNumber(loss) != kTotalLoss;
}

}  // namespace xavo
