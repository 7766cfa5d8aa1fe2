// Lists the network printer IDs of the network printer table.
#include <syslog.h>

#include <cstdio>
#include <cstring>
#include <string>

#include "internal/boundary.h"
#include "internal/guards.h"
#include "internal/line_reader.h"
#include "internal/log.h"
#include "net/net_paths.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_net_nptab_enum";
constexpr char kLogListAllocFailed[] = "%s:%d ORLICSzListAlloc failed. [0x%04X %s:%d]";
constexpr char kLogSepFailed[] = "%s:%d ORLICStrSep failed. [0x%04X %s:%d]";
constexpr char kLogParseFailed[] = "%s:%d Parse printer name failed. %d";
constexpr char kLogIdFailed[] = "%s:%d Failed to get network printer ID.[0x%04X %s:%d]";
constexpr char kFieldDelimiters[] = "=\"";
constexpr char kIdFormat[] = "%s-%s";
constexpr int32_t kListCapacity = 1024;
// Fields of a line: address, the empty field between "=" and the quote,
// name, then the rest of the line.
constexpr int kAddressField = 0;
constexpr int kNameField = 2;
constexpr int kMinFields = 3;

// Appends the printer ID of one table line; false on a bad line, logged.
bool ListLine(const std::string &line, ORLICSzList **ppList) {
    xavo::SzList fields(ORLICSzListAlloc(kListCapacity));
    if (!fields) {
        // The platform sets no code for a failed allocation; the caller's
        // message should not show a stale one.
        XSETERR(ERR_OUT_OF_MEMORY);
        XLOG(LOG_ERR, kLogListAllocFailed, XERR_TAIL);
        return false;
    }
    if (ORLICStrSep(line.c_str(), kFieldDelimiters, fields.addr()) < 0) {
        XLOG(LOG_ERR, kLogSepFailed, XERR_TAIL);
        return false;
    }
    const int iFields = xavo::ListCount(fields.get());
    if (iFields < kMinFields) {
        XLOG(LOG_ERR, kLogParseFailed, iFields);
        return false;
    }
    const char *szAddress = xavo::ListItem(fields.get(), kAddressField);
    const char *szName = xavo::ListItem(fields.get(), kNameField);
    // The ID must fit with its NUL: address, hyphen and name in 1024 bytes.
    char szId[xavo::kNetPrinterIdSize];
    if (std::snprintf(szId, sizeof szId, kIdFormat, szAddress, szName) >= static_cast<int>(sizeof szId)) {
        XSETERR(ERR_BUF_TOO_SMALL);
        return false;
    }
    fields.reset();
    ORLICSzListPush(ppList, szId);
    return true;
}

}  // namespace

XAVO_EXPORT int32_t XAVOPrinterNetNptabEnum(ORLICSzList **ppList) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (!XARG_OK(nullptr != ppList, "((void *)0) != ppList")) return -1;
        xavo::File table(std::fopen(xavo::kNptabPath, "r"));
        if (!table) {
            // No table: no network printer is registered.
            XSETERR(ERR_OPEN);
            return 0;
        }
        // Lines are read whole, however long: a line cut at a read buffer
        // would list its tail as a printer of its own, and an address and
        // name too long for an ID must fail as such.  A regular file's read
        // is never interrupted by a signal.
        std::string line;
        while (xavo::ReadLine(table.get(), line) == xavo::ReadStatus::kLine) {
            if (line.empty() || line == "\n") continue;
            // One bad line ends the listing; the IDs before it stay listed.
            if (!ListLine(line, ppList)) {
                XLOG(LOG_ERR, kLogIdFailed, XERR_TAIL);
                return -1;
            }
        }
        return 0;
    });
}
