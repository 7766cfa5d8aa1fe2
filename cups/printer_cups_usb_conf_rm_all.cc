#include <syslog.h>
#include <unistd.h>

#include <cstdio>
#include <cstring>

#include "cups/queue_create.h"
#include "internal/boundary.h"
#include "internal/guards.h"
#include "internal/log.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_cups_usb_conf_rm_all";
constexpr char kLogAlive[] = "%s:%d skip remove printer, %s alive. [0x%04X %s:%d]";
constexpr char kPrintersConf[] = "/etc/cups/printers.conf";
constexpr char kTempTemplate[] = "/etc/cups/printers.conf.XXXXXX";
constexpr char kBlockEnd[] = "</Printer>";
constexpr int kTemplateSize = 256;
constexpr int kLineSize = 1024;

// The opening lines of the blocks of the library's own USB queues, closing
// ">" included so that a queue whose name merely begins the same stays.
constexpr const char *kUsbBlockStarts[] = {"<Printer usbprinter>", "<Printer usbprinter1>",
                                          "<Printer usbprinter2>"};

bool BeginsWith(const char *szLine, const char *szPrefix) {
    return std::strncmp(szLine, szPrefix, std::strlen(szPrefix)) == 0;
}

bool OpensUsbBlock(const char *szLine) {
    for (const char *szStart : kUsbBlockStarts) {
        if (BeginsWith(szLine, szStart)) return true;
    }
    return false;
}
}  // namespace

XAVO_EXPORT int32_t XAVOPrinterCupsUsbConfRmAll(void) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        // cupsd rewrites the file from memory whenever its queues change,
        // which would undo the edit or interleave with it.
        if (ORLIServiceIsRunning(xavo::kSchedulerService) == 1) {
            XSETERR(ERR_SERVICE_RUNNING);
            XLOG(LOG_ERR, kLogAlive, xavo::kSchedulerService, XERR_TAIL);
            return -1;
        }
        if (ORLICFileExist(kPrintersConf) == 0) return 0;
        xavo::File source(std::fopen(kPrintersConf, "r"));
        if (!source) {
            XSETERR(ERR_OPEN);
            return -1;
        }
        char szTemp[kTemplateSize] = {};
        std::snprintf(szTemp, sizeof szTemp, "%s", kTempTemplate);
        xavo::File temp(ORLICFileTempFileOpen(szTemp));
        if (!temp) {
            XSETERR(ERR_OPEN);
            return -1;
        }
        bool bDropping = false;
        char szLine[kLineSize] = {};
        while (std::fgets(szLine, sizeof szLine, source.get()) != nullptr) {
            if (bDropping) {
                if (BeginsWith(szLine, kBlockEnd)) bDropping = false;
            } else if (OpensUsbBlock(szLine)) {
                bDropping = true;
            } else if (std::fputs(szLine, temp.get()) == EOF) {
                XSETERR(ERR_WRITE);
                return -1;
            }
        }
        // A source that could not be read to its end is not replaced by
        // the part that was read.
        if (std::ferror(source.get())) {
            XSETERR(ERR_READ);
            return -1;
        }
        // A write that fails only when the buffer goes out (a full disk)
        // must not let a cut copy replace the scheduler's file, nor may a
        // power cut after the rename leave it empty.
        source.reset();
        if (std::fflush(temp.get()) != 0 || std::ferror(temp.get()) || ::fsync(::fileno(temp.get())) != 0) {
            XSETERR(ERR_WRITE);
            return -1;
        }
        // rename() puts the new file in place in one step: a failed rename
        // leaves the old file whole.  The stream stays open until then: the
        // platform keeps a temporary file locked while it is open, which is
        // how the next edit tells this one from the leftovers of an edit
        // that was killed, and removes only those.
        if (std::rename(szTemp, kPrintersConf) != 0) {
            XSETERR(ERR_RENAME);
            return -1;
        }
        return 0;
    });
}
