#include "internal/guards.h"

#include "xavoprinter.h"

namespace xavo {

PrinterLock::PrinterLock() : fd_(XAVOPrinterPrinterConfLock()) {}

PrinterLock::~PrinterLock() {
    if (fd_ >= 0) XAVOPrinterPrinterConfUnlock(fd_);
}

}  // namespace xavo
