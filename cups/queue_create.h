// What the CUPS queue units share: the scheduler, the tools' paths, the
// library's own USB queue names, and for the creation of USB and network
// queues the PPD file to install, the lpadmin argument vector and its
// runner.  Messages are logged under the calling unit's name, as the
// appliance's log readers expect.
#pragma once

#include <cstdint>

#include "internal/argv.h"
#include "internal/name_path.h"

namespace xavo {

inline constexpr char kSchedulerService[] = "cupsd";
inline constexpr char kLpadminPath[] = "/usr/bin/lpadmin";
inline constexpr char kPpdDir[] = "/etc/cups/ppd/";
// A printer's kept PPD copy: "/etc/cups/ppd/" + printer ID + ".ppd".
inline constexpr NamedFile kKeptPpd{kPpdDir, ".ppd"};
// The first USB queue and its alias, which is made, switched and removed
// with it.
inline constexpr char kFirstUsbQueue[] = "usbprinter1";
inline constexpr char kUsbQueueAlias[] = "usbprinter";

// Makes sure "cupsd" runs, starting it when it does not; false (logged)
// when it cannot be started.
bool SchedulerEnsure(const char *szUnit);
// Whether the platform reports "cupsd" running (any non-zero answer).
bool SchedulerRunning();

// Copies szPpdFile to the kept copy "/etc/cups/ppd/<printer ID>.ppd".
int32_t PrinterBackupPpd(const char *szPpdFile, const char *szPrinterId);

// Whether a printer ID can name a kept copy: it holds no "/" (the copy
// would land in another directory) and no file name pattern character (the
// copy's path goes to "/bin/cp" through the platform's runner, and a USB
// printer's ID carries the serial number the device reports).  The library
// never keeps a copy under any other ID, so none is ever looked for either.
bool KeptPpdName(const char *szPrinterId);

// The PPD file a new queue is created with: the caller's file (kept as the
// printer's copy on the way), or the printer's kept copy, or none.
struct PpdChoice {
    bool bOk = true;       // false: the caller's file is missing (logged)
    bool bUse = false;     // a PPD file is to be passed with "-P"
    char szPath[512] = {};
};
PpdChoice PpdChoose(const char *szPpdFile, const char *szPrinterId, const char *szUnit);

// The 11-slot lpadmin vector of queue creation:
// "/usr/bin/lpadmin" "-p" NAME "-E" "-v" URI ["-L" HOST] ["-P" PPD].
class LpadminCreate {
public:
    // Fills the six fixed slots and the location; false when a copy cannot
    // be allocated (ERR_OUT_OF_MEMORY set).
    bool Init(const char *szQueue, const char *szDeviceUri, const char *szUnit, int iLine);
    bool SetQueue(const char *szQueue, const char *szUnit, int iLine);
    bool AddPpd(const char *szPpdPath, const char *szUnit, int iLine);
    // Frees the two "-P" slots again, if they were filled.
    void DropPpd();
    // Runs lpadmin up to 3 times, 2 seconds apart; logs every failed
    // attempt under the queue name.  True when an attempt succeeded.
    bool Run(const char *szUnit) const;

private:
    static constexpr size_t kSlots = 11;
    ArgVector argv_{kSlots};
    size_t ppdSlot_ = 0;  // index of "-P" when present, else 0
};

}  // namespace xavo
