#include <cstdio>

#include "cups/queue_create.h"
#include "internal/boundary.h"
#include "internal/guards.h"
#include "internal/log.h"
#include "internal/name_path.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_cups_get_ppd";
constexpr int kPathSize = 388;
}  // namespace

XAVO_EXPORT char *XAVOCupsGetPPD(const char *szPpdName) noexcept {
    return XAVO_BOUNDARY(static_cast<char *>(nullptr), [&]() -> char * {
        // The name is a base name under "/etc/cups/ppd/": one that holds
        // "/" would read any file, and one too long for the 388-byte path
        // is refused rather than cut (cutting ".ppd" off opens the name
        // itself, whatever it points at).
        char szPath[kPathSize] = {};
        if (szPpdName == nullptr || !xavo::NamePath(szPath, xavo::kKeptPpd, szPpdName)) {
            XSETERR(ERR_BAD_PARAMETERS);
            return nullptr;
        }
        xavo::File file(std::fopen(szPath, "r"));
        if (!file) {
            XSETERR(ERR_OPEN);
            return nullptr;
        }
        char *szText = nullptr;
        int32_t cbText = 0;
        xavo::HeapText line;
        size_t cbLine = 0;
        // The end is tested before each read, so a file whose last line
        // ends in a newline finishes with an empty read: the text is whole
        // and ERR_READ is set beside it.  The text, not the code, tells the
        // caller whether anything was read.
        while (!std::feof(file.get())) {
            char *pLine = line.release();
            ssize_t n = getdelim(&pLine, &cbLine, '\n', file.get());
            line.reset(pLine);
            if (n <= 0) {
                XSETERR(ERR_READ);
                break;
            }
            if (ORLICStrCat(&szText, &cbText, line.get()) < 0) {
                std::free(szText);
                szText = nullptr;
                break;
            }
        }
        return szText;
    });
}
