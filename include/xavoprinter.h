/*
 * xavoprinter.h - public interface of libxavoprinter.so.6, the printer
 * management library of the appliance.
 *
 * Every function returns a signed 32-bit result (0 on success, -1 on
 * failure unless its description says otherwise) and reports the reason of a
 * failure through the platform's last error (ORLICErrGet and friends,
 * declared in xavocore.h).  Records are plain fixed-size structures
 * owned by the caller; the library never keeps a pointer to them past the
 * call.  Texts copied into a caller's buffer or field are cut to its size
 * minus one and NUL-terminated.  What a call allocates for its caller is
 * named with the call: string lists are released with ORLICSzListFree,
 * other blocks with free().  The header compiles as C99 and as C++.
 */
#ifndef XAVOPRINTER_H
#define XAVOPRINTER_H

#include <stddef.h>
#include <stdint.h>

#include "xavocore.h"

/* The operations never throw; C++ callers may rely on it. */
#if defined(__cplusplus) && __cplusplus >= 201103L
#define XAVOPRINTER_NOEXCEPT noexcept
#else
#define XAVOPRINTER_NOEXCEPT
#endif

#ifdef __cplusplus
extern "C" {
#endif

/* Error codes the library sets itself with ORLICErrSetEx. */
#define ERR_BUF_TOO_SMALL 0x0100u
#define ERR_OUT_OF_MEMORY 0x0200u
#define ERR_LOCK 0x0400u
#define ERR_UNLOCK 0x0500u
#define ERR_OPEN 0x0900u
#define ERR_READ 0x0A00u
#define ERR_WRITE 0x0B00u
#define ERR_BAD_PARAMETERS 0x0D00u
#define ERR_KEY_NOT_FOUND 0x2000u
#define ERR_NOT_FOUND 0x2600u
#define ERR_RENAME 0x2800u
#define ERR_EXEC 0x2A00u
#define ERR_REMOVE_KEY 0x3900u
#define ERR_BAD_DATA 0xBF00u
#define ERR_SERVICE_RUNNING 0xD000u

/* Selection bits of XAVOPrinterEnumCount. */
#define XAVO_PRINTER_TYPE_USB 1
#define XAVO_PRINTER_TYPE_NET 2

/* A USB printer's section of the printer configuration file: 2208 bytes,
 * fixed-size NUL-terminated texts (at most width - 1 characters each). */
typedef struct UsbPrinterConf {
    char szManualLockTimer[4];
    char szAutoLockTimer[4];
    char szMode[128];
    char szPrinterId[128];
    char szProducer[128];
    char szProductName[256];
    char szEnableAirprint[8];
    char szEnableGoogleCloudPrint[8];
    char szDriverBrand[128];
    char szDriver[128];
    char szUsblpStringId[1024];
    char szBrand[128];
    char szModel[128];
    char szFitToPage[8];
} UsbPrinterConf;

/* A network printer's configuration: 4136 bytes. */
typedef struct NetPrinterConf {
    char szIP[16];
    char szCupsPrinterName[128];
    char szBackend[128];
    char szQName[128];
    char szBrand[128];
    char szModel[128];
    char szEnableAirprint[8];
    char szEnableGoogleCloudPrint[8];
    /* Laid out by the appliance's other services; the library neither reads
     * nor writes it. */
    unsigned char abReserved[2048];
    char szDriverBrand[128];
    char szDriver[128];
    char szStringId[1024];
    char szPrinterId[128];
    /* Only ever read as a NUL-terminated text.  Eight bytes, the width the
     * same flag has in UsbPrinterConf, so that callers can copy one into the
     * other without cutting. */
    char szFitToPage[8];
} NetPrinterConf;

/* What identification learned of a network printer: 5136 bytes. */
typedef struct NetPrinterInfo {
    char szIP[16];
    char szBackend[1024];
    char szQName[1024];
    char szBrand[1024];
    char szModel[1024];
    char szStringId[1024];
} NetPrinterInfo;

/* The cloud print account, in clear: 639 bytes (no padding). */
typedef struct PrinterGoogleInfo {
    char szAccount[255];
    char szPassword[128];
    char szRefreshToken[256];
} PrinterGoogleInfo;

/* Record layouts are part of the ABI: pin them.  A false condition makes a
 * negative array size, which C99 and C++ both reject; _Static_assert would
 * be C11. */
#define XAVO_LAYOUT_CHECK(name, cond) typedef char xavo_layout_check_##name[(cond) ? 1 : -1]
XAVO_LAYOUT_CHECK(UsbPrinterConf_size, sizeof(UsbPrinterConf) == 2208);
XAVO_LAYOUT_CHECK(UsbPrinterConf_szMode, offsetof(UsbPrinterConf, szMode) == 8);
XAVO_LAYOUT_CHECK(UsbPrinterConf_szPrinterId, offsetof(UsbPrinterConf, szPrinterId) == 136);
XAVO_LAYOUT_CHECK(UsbPrinterConf_szProductName, offsetof(UsbPrinterConf, szProductName) == 392);
XAVO_LAYOUT_CHECK(UsbPrinterConf_szDriverBrand, offsetof(UsbPrinterConf, szDriverBrand) == 664);
XAVO_LAYOUT_CHECK(UsbPrinterConf_szUsblpStringId, offsetof(UsbPrinterConf, szUsblpStringId) == 920);
XAVO_LAYOUT_CHECK(UsbPrinterConf_szBrand, offsetof(UsbPrinterConf, szBrand) == 1944);
XAVO_LAYOUT_CHECK(UsbPrinterConf_szFitToPage, offsetof(UsbPrinterConf, szFitToPage) == 2200);
XAVO_LAYOUT_CHECK(NetPrinterConf_size, sizeof(NetPrinterConf) == 4136);
XAVO_LAYOUT_CHECK(NetPrinterConf_szCupsPrinterName, offsetof(NetPrinterConf, szCupsPrinterName) == 16);
XAVO_LAYOUT_CHECK(NetPrinterConf_abReserved, offsetof(NetPrinterConf, abReserved) == 672);
XAVO_LAYOUT_CHECK(NetPrinterConf_szDriverBrand, offsetof(NetPrinterConf, szDriverBrand) == 2720);
XAVO_LAYOUT_CHECK(NetPrinterConf_szStringId, offsetof(NetPrinterConf, szStringId) == 2976);
XAVO_LAYOUT_CHECK(NetPrinterConf_szPrinterId, offsetof(NetPrinterConf, szPrinterId) == 4000);
XAVO_LAYOUT_CHECK(NetPrinterConf_szFitToPage, offsetof(NetPrinterConf, szFitToPage) == 4128);
XAVO_LAYOUT_CHECK(NetPrinterInfo_size, sizeof(NetPrinterInfo) == 5136);
XAVO_LAYOUT_CHECK(NetPrinterInfo_szBackend, offsetof(NetPrinterInfo, szBackend) == 16);
XAVO_LAYOUT_CHECK(NetPrinterInfo_szStringId, offsetof(NetPrinterInfo, szStringId) == 4112);
XAVO_LAYOUT_CHECK(PrinterGoogleInfo_size, sizeof(PrinterGoogleInfo) == 639);
XAVO_LAYOUT_CHECK(PrinterGoogleInfo_szPassword, offsetof(PrinterGoogleInfo, szPassword) == 255);
XAVO_LAYOUT_CHECK(PrinterGoogleInfo_szRefreshToken, offsetof(PrinterGoogleInfo, szRefreshToken) == 383);
#undef XAVO_LAYOUT_CHECK

/* ---- printer configuration and lock -------------------------------------
 * "/usr/xavo/etc/printer.conf" holds one section per printer, named by its
 * printer ID.  Writers hold the printer lock around their write; readers
 * do not take it. */

/* Takes the printer lock ("/run/xavosdk/lock/lock_printer"): up to 100
 * tries 50 ms apart.  Returns the descriptor that holds it (0 or more),
 * which the caller gives back to XAVOPrinterPrinterConfUnlock, or -1 when
 * it stayed busy (no error code set). */
int32_t XAVOPrinterPrinterConfLock(void) XAVOPRINTER_NOEXCEPT;
/* Releases the printer lock by closing fdLock.  Returns 1 when closed, 0
 * when fdLock is negative (ERR_BAD_PARAMETERS) or the close failed. */
int32_t XAVOPrinterPrinterConfUnlock(int32_t fdLock) XAVOPRINTER_NOEXCEPT;
/* Adds or replaces the section szPrinterId of a USB printer, merging the
 * record's non-empty fields into the stored keys; keys the record does not
 * carry ("cups printer name") survive.  blWriteEmpty non-zero also writes
 * the empty timers, "driver" and "driver brand", clearing them.  Takes the
 * printer lock itself.  Returns 0, or -1 (or the platform's negative
 * section-add result) with the last error set; ERR_LOCK when the lock
 * stayed busy (file untouched). */
int32_t XAVOPrinterConfSetup(const UsbPrinterConf *pPrinterConf, int32_t blWriteEmpty) XAVOPRINTER_NOEXCEPT;
/* Copies the printer's "cups printer name" into szBuf.  Returns 0 when it is set and non-empty; -1 when missing or empty, or
 * with ERR_BAD_PARAMETERS for a null argument or cbBuf <= 0. */
int32_t XAVOPrinterCupsNameGet(const char *szPrinterId, char *szBuf, int32_t cbBuf) XAVOPRINTER_NOEXCEPT;

/* ---- device ID strings ----------------------------------------------------
 * An IEEE 1284 device ID string is pairs "KEY:value;"
 * ("MFG:ACME;MDL:Model 100;CMD:PCL,PJL;").  szStringId is writable: the
 * search changes one byte while it runs and restores it before returning.
 * Values are copied into szBuf; on -1 szBuf is left unchanged. */

/* Copies the value of key szType, which includes its colon ("MDL:"; a
 * plain "MDL" would also match ":Model 100" and return ":Model 100"):
 * the first place szType occurs in the string, case ignored, to the next
 * ';' or the end.  Returns 0 when found (an empty value counts), -1 when
 * not found (no error code) or with ERR_BAD_PARAMETERS for a null or empty
 * szStringId or szType, a null szBuf or cbBuf <= 0. */
int32_t XAVOPrinterConfStringIdParse(char *szStringId, const char *szType, char *szBuf, int32_t cbBuf) XAVOPRINTER_NOEXCEPT;
/* The manufacturer: the first of "MANUFACTURER:", "MFG:", "MFR:" found.
 * Returns 0 or -1 as XAVOPrinterConfStringIdParse (a bad argument is
 * reported once per key tried). */
int32_t XAVOPrinterConfStringIdGetVendor(char *szStringId, char *szBuf, int32_t cbBuf) XAVOPRINTER_NOEXCEPT;
/* The model: the first of "MODEL:", "MDL:", "DESCRIPTION:", "DES:" found.
 * Returns 0 or -1. */
int32_t XAVOPrinterConfStringIdGetModel(char *szStringId, char *szBuf, int32_t cbBuf) XAVOPRINTER_NOEXCEPT;
/* The command set: the first of "COMMAND SET:", "CMD:" found.  Returns 0
 * or -1. */
int32_t XAVOPrinterConfStringIdGetCmd(char *szStringId, char *szBuf, int32_t cbBuf) XAVOPRINTER_NOEXCEPT;
/* Fills szBrand and szModel (each cut to 127 characters; no other field is
 * written) from the device ID string stored for pPrinterConf->szPrinterId,
 * taking the first pair whose key is exactly "MFG"/"MANUFACTURER",
 * respectively "MDL"/"MODEL" (case counts).  A field not found keeps the
 * caller's value.  Returns 0 when the string was obtained, found or not;
 * -1 with ERR_BAD_PARAMETERS (null record) or ERR_EXEC (no stored
 * string). */
int32_t XAVOPrinterModelDetect(UsbPrinterConf *pPrinterConf) XAVOPRINTER_NOEXCEPT;

/* ---- USB device access -----------------------------------------------------
 * szDevName is a usblp name ("lp0", opened as "/dev/usb/lp0") or a path
 * beginning with "/dev/", used as is.  These three set no error code. */

/* Opens the device read-only; a busy device (EBUSY) is tried nRetry more
 * times, one second apart.  Returns the descriptor, which the caller
 * closes, or -1. */
int32_t XAVOPrinterDevOpen(const char *szDevName, int32_t nRetry) XAVOPRINTER_NOEXCEPT;
/* Reads the device's device ID string into szBuf, cut to cbBuf - 1
 * characters.  Returns 0 when it fits; the length the device states (a
 * number greater than cbBuf) when it was cut; -1 when the device could not
 * be opened or did not answer 8 requests. */
int32_t XAVOPrinterGetStringId(const char *szDevName, char *szBuf, int32_t cbBuf) XAVOPRINTER_NOEXCEPT;
/* Soft-resets the device.  Returns 0 when the driver accepted it, else -1. */
int32_t XAVOResetPrinter(const char *szDevName) XAVOPRINTER_NOEXCEPT;

/* ---- USB printer listing and counting ----------------------------------- */

/* Lists the usblp device names of the plugged-in USB printers.  Frees the
 * array *pppszDevNames held from an earlier call (or NULL) and stores a
 * new one: a single allocation holding the pointers and their texts, which
 * the caller releases with free(); *piCount receives the number of names.
 * Returns 0, or -1 with *pppszDevNames set to NULL. */
int32_t XAVOPrinterUsbtabEnum(char ***pppszDevNames, int32_t *piCount) XAVOPRINTER_NOEXCEPT;
/* APPENDS the printer ID of every plugged-in USB printer to the caller's
 * list *ppList (made with ORLICSzListAlloc), in device-name order; items
 * already there stay.  The caller frees the list.  Returns 0 or -1. */
int32_t XAVOPrinterProcUsbtabIdEnum(ORLICSzList **ppList) XAVOPRINTER_NOEXCEPT;
/* Counts the printers of the types selected in iType
 * (XAVO_PRINTER_TYPE_USB | XAVO_PRINTER_TYPE_NET; other bits ignored).
 * Returns the count, or -1.  When ppList is not NULL and the call succeeds,
 * the list it held is freed and REPLACED by a new one of the printer IDs
 * (USB first, then network), which the caller frees with ORLICSzListFree. */
int32_t XAVOPrinterEnumCount(int32_t iType, ORLICSzList **ppList) XAVOPRINTER_NOEXCEPT;

/* ---- USB enable and disable --------------------------------------------- */

/* The hotplug handler's call.  action non-zero: registers the printer on
 * szDevName ("lp0" or "lp1") at USB bus ID szBusId (both required) -- its
 * table line, its section, the driver's enable request and the Samba
 * printers share; no CUPS queue.  action 0: removes its table line (found
 * by szDevName, or by szBusId when szDevName is NULL) and sends the
 * disable request; the section stays.  Returns 0, also for a device beyond
 * the two supported (nothing done), or -1 with the last error set. */
int32_t XAVOPrinterEnableExt(int32_t action, const char *szDevName, const char *szBusId) XAVOPRINTER_NOEXCEPT;

/* ---- network printer table and records -----------------------------------
 * A network printer's ID is "<szIP>-<szCupsPrinterName>" (at most 1023
 * characters). */

/* iAction non-zero: adds or replaces the line szIP = szCupsPrinterName of
 * the network printer table "/usr/xavo/etc/nptab" and makes sure the Samba
 * printers share exists; 0: removes the line.  Only those two fields of
 * *pNPConf are read.  Returns 0 or -1 with the last error set. */
int32_t XAVOPrinterNetUpdateConf(int32_t iAction, const NetPrinterConf *pNPConf) XAVOPRINTER_NOEXCEPT;
/* APPENDS the ID of every network printer in the table to the caller's
 * list *ppList, in table order; items already there stay, and so do IDs
 * appended before a failure.  The caller frees the list.  Returns 0 (also
 * when there is no table) or -1 (ERR_BUF_TOO_SMALL for an ID over 1023
 * characters). */
int32_t XAVOPrinterNetNptabEnum(ORLICSzList **ppList) XAVOPRINTER_NOEXCEPT;
/* Adds or replaces the network printer's section (named szPrinterId),
 * merging the record's non-empty fields into the stored keys;
 * blWriteEmpty non-zero also writes empty "driver brand" and "driver",
 * clearing them.  Takes the printer lock itself.  Returns 0, or -1 (or the
 * platform's negative section-add result) with the last error set. */
int32_t XAVOPrinterNetConfSetup(const NetPrinterConf *pNPConf, int32_t blWriteEmpty) XAVOPRINTER_NOEXCEPT;

/* ---- network identification and reachability ------------------------------
 * The identification calls answer 0 (found), 1 (nothing found this way) or
 * -1 (failure).  They keep the caller's errno. */

/* Walks the printer's SNMP enterprises subtree for its device ID string.
 * szOutBuf is cleared over iOutSize bytes first and holds the string only
 * on 0.  Returns 0; 1 when the printer printed nothing (no SNMP answer);
 * -1 on failure, including output without a device ID string and
 * ERR_BAD_DATA when the string is longer than the buffer. */
int32_t XAVOPrinterNetGetStringId(const char *szIP, char *szOutBuf, int32_t iOutSize) XAVOPRINTER_NOEXCEPT;
/* Walks the printer's SNMP enterprises subtree for a printer URI.  On 0
 * szBackend holds "lpd", "ipp", "socket" or "bjnp" and szQName the remote
 * queue name (possibly empty).  Returns 1 when no
 * accepted URI was printed, -1 on failure (szBackend may be written
 * then). */
int32_t XAVOPrinterNetGetStringBackend(const char *szIP, char *szBackend, uint32_t cbBackend,
                                       char *szQName, uint32_t cbQName) XAVOPRINTER_NOEXCEPT;
/* Identifies the printer at szIP by SNMP, clearing *pNPInfo first (szIP
 * included).  Returns 0 with szBackend, szQName, szStringId, szBrand and
 * szModel filled; 1 when SNMP did not identify it (the record holds what
 * was found: try XAVOPrinterNetAvahiInfoGet, then
 * XAVOPrinterNetBjnpInfoGet); -1 on failure. */
int32_t XAVOPrinterNetInfoGetByIP(const char *szIP, NetPrinterInfo *pNPInfo) XAVOPRINTER_NOEXCEPT;
/* Completes *pNPInfo from the mDNS services announced at szIP.  Returns 0
 * with szBackend set, szBrand and szModel from the TXT record (or "Not
 * Found"), and szStringId built only if it was empty; szIP and szQName are
 * never written.  1 when no printer service is announced there (record
 * untouched); -1 on failure. */
int32_t XAVOPrinterNetAvahiInfoGet(const char *szIP, NetPrinterInfo *pNPInfo) XAVOPRINTER_NOEXCEPT;
/* Completes *pNPInfo from the BJNP backend's device listing.  Returns 0
 * with szBackend "bjnp" and szBrand, szModel, szStringId filled; 1 when
 * the printer is not listed (record untouched); -1 on a bad argument or
 * after three failed attempts. */
int32_t XAVOPrinterNetBjnpInfoGet(const char *szIP, NetPrinterInfo *pNPInfo) XAVOPRINTER_NOEXCEPT;
/* Pings szIP and writes "Online" or "Offline" into szStatus.  Returns 0 when a status was written; -1 on a bad argument
 * or when ping could not be run or read (szStatus then unwritten or
 * unchanged). */
int32_t XAVOPrinterNetPingStatus(const char *szIP, char *szStatus, int32_t cbStatus) XAVOPRINTER_NOEXCEPT;

/* ---- CUPS queues ----------------------------------------------------------- */

/* Creates the CUPS queue of a registered USB printer: "usbprinter1" (plus
 * its alias "usbprinter") or "usbprinter2", device URI
 * "usb:/dev/usb/<szPrinterId>", left disabled, and stores its name under
 * "cups printer name".  szPpdFile (NULL or empty for none) is installed
 * with it and kept as "/etc/cups/ppd/<szPrinterId>.ppd".  Starts cupsd if
 * needed.  Returns 0 or -1. */
int32_t XAVOPrinterCupsAdd(const char *szPrinterId, const char *szPpdFile) XAVOPRINTER_NOEXCEPT;
/* Enables (blEnable non-zero) or disables a CUPS queue by name.  Returns 0
 * or -1. */
int32_t XAVOPrinterCupsPrinterEnable(const char *szCupsPrinterName, int32_t blEnable) XAVOPRINTER_NOEXCEPT;
/* How szCupsPrinterName is used in CUPS's queue list.  Returns 0 when no
 * queue line contains it (also when cupsd is not running); 1 when the
 * first line that does also contains szPrinterId (this printer's queue); 2
 * when it does not (another device's); -1 on a bad argument or when the
 * list could not be read. */
int32_t XAVOPrinterCupsNameCheck(const char *szPrinterId, const char *szCupsPrinterName) XAVOPRINTER_NOEXCEPT;
/* Creates or changes the queue pNPConf->szCupsPrinterName with device URI
 * "<szBackend>://<szIP>/<szQName>", enabled; szPpdFile as for
 * XAVOPrinterCupsAdd.  Returns 0 when lpadmin succeeded, else -1. */
int32_t XAVOPrinterNetCupsAdd(const NetPrinterConf *pNPConf, const char *szPpdFile) XAVOPRINTER_NOEXCEPT;
/* Reads the kept PPD "/etc/cups/ppd/<szPpdName>.ppd" (szPpdName is a
 * printer ID, without ".ppd").  Returns the whole text in a new allocation
 * that the caller releases with free(), or NULL (ERR_BAD_PARAMETERS,
 * ERR_OPEN).  A text may come back with ERR_READ set at the end of the
 * file. */
char *XAVOCupsGetPPD(const char *szPpdName) XAVOPRINTER_NOEXCEPT;
/* Removes the CUPS queue of a USB printer, found through its "cups printer
 * name".  Returns XAVOPrinterCupsRmByName's result, or -1. */
int32_t XAVOPrinterCupsRm(const char *szPrinterId) XAVOPRINTER_NOEXCEPT;
/* Removes the queue szCupsPrinterName with lpadmin, and the alias
 * "usbprinter" with "usbprinter1".  Returns 0 or -1. */
int32_t XAVOPrinterCupsRmByName(const char *szCupsPrinterName) XAVOPRINTER_NOEXCEPT;
/* Removes the CUPS queue of a network printer ("<IP>-<name>" ID).  Returns
 * XAVOPrinterCupsRmByName's result, or -1. */
int32_t XAVOPrinterNetCupsRm(const char *szPrinterId) XAVOPRINTER_NOEXCEPT;
/* Removes every USB queue from CUPS's "/etc/cups/printers.conf" while
 * cupsd is stopped (ERR_SERVICE_RUNNING otherwise).  Returns 0 when the
 * file was rewritten or does not exist, -1 on failure. */
int32_t XAVOPrinterCupsUsbConfRmAll(void) XAVOPRINTER_NOEXCEPT;
/* Whether a queue serves szIP (a queue line contains "/<szIP>/").  NOTE
 * the order: returns 0 when one DOES, 1 when none does (also when cupsd is
 * not running or there are no printers), -1 on failure. */
int32_t XAVOPrinterNetIPCheck(const char *szIP) XAVOPRINTER_NOEXCEPT;
/* How the queue name szCupsPrinterName is used.  Returns 0 when no queue
 * has that name (also when cupsd is not running or there are no
 * printers); 1 when the first queue of that name serves szIP; 2 when it
 * serves another device; -1 on failure. */
int32_t XAVOPrinterNetCupsNameAndIPCheck(const char *szIP, const char *szCupsPrinterName) XAVOPRINTER_NOEXCEPT;

/* ---- printing and jobs ------------------------------------------------------
 * The printer needs a "cups printer name" in its section and an existing
 * queue.  A bad argument gives -1 with ERR_BAD_PARAMETERS. */

/* Prints szFile on the printer's queue with lpr, titled szTitle (NULL or
 * empty: no title).  blRemove exactly 1 lets CUPS delete the file after
 * submitting it; any other value leaves it.  Returns 0 when lpr succeeded,
 * else -1. */
int32_t XAVOPrinterCupsPrintFile(const char *szPrinterId, const char *szFile, const char *szTitle,
                                 int32_t blRemove) XAVOPRINTER_NOEXCEPT;
/* Prints CUPS's test page "/usr/share/cups/data/testprint" (never
 * removed).  Returns 0 or -1. */
int32_t XAVOPrinterCupsPrintTestPage(const char *szPrinterId) XAVOPRINTER_NOEXCEPT;
/* Whether the job szJobId (a title, file name or job number as lpq shows
 * it) is still in the printer's queue.  Returns 1 while listed, 0 once a
 * complete listing no longer holds it, -1 on failure.  Does not wait:
 * callers poll. */
int32_t XAVOPrinterCupsJobWaitComplete(const char *szPrinterId, const char *szJobId) XAVOPRINTER_NOEXCEPT;
/* The USB/IP sharing service's queue text ("QUEUE" of "/tmp/usbip_<ID>")
 * with its remark in parentheses rewritten to "(CUPS Jobs...", in szBuf.
 * Returns 0 when written (the raw text when it cannot
 * be rewritten), -1 on a bad argument or when the key cannot be read. */
int32_t XAVOPrinterQueueGet(const char *szPrinterId, char *szBuf, int32_t cbBuf) XAVOPRINTER_NOEXCEPT;
/* Cancels every job and empties the spool directory
 * "/var/services/printer".  Returns 0 when emptied, -1 when the removal
 * failed (a failed cancel alone does not count). */
int32_t XAVOPrinterCleanSpool(void) XAVOPRINTER_NOEXCEPT;

/* ---- sharing services -------------------------------------------------------- */

/* Returns 1 when the Samba "printers" share of
 * "/etc/samba/smb.reserved.conf" holds at least 8 entries (the library
 * writes 7, the appliance's Samba service adds its own), else 0.  Not a
 * 0/-1 result. */
int32_t XAVOPrinterIsActive(void) XAVOPRINTER_NOEXCEPT;
/* Reads the cloud print account, clearing *pInfo first.  Returns 0 with
 * szAccount (cut to 254) and exactly one of szPassword (127) or
 * szRefreshToken (255) deciphered; -1 otherwise (szAccount may still be
 * filled). */
int32_t XAVOPrinterGoogleInfoGet(PrinterGoogleInfo *pInfo) XAVOPRINTER_NOEXCEPT;
/* Stores the cloud print account, secrets enciphered, in the section
 * "Google Cloud Print"; takes the printer lock itself.  Returns 0, or -1
 * (or the platform's negative section-write result). */
int32_t XAVOPrinterGoogleInfoSet(const PrinterGoogleInfo *pInfo) XAVOPRINTER_NOEXCEPT;
/* Asks the appliance's bind_driver to eject the printer from USB/IP
 * sharing.  Returns 0 when it reported success, else -1. */
int32_t XAVOPrinterUsbipEject(const char *szPrinterId) XAVOPRINTER_NOEXCEPT;
/* Copies the "LOCK" status of "/tmp/usbip_<szPrinterId>" into szBuf, or
 * "Free" when there is none.  Returns 0 whenever the
 * arguments are good, -1 (ERR_BAD_PARAMETERS) otherwise. */
int32_t XAVOPrinterUsbipGetLockStatus(const char *szPrinterId, char *szBuf, int32_t cbBuf) XAVOPRINTER_NOEXCEPT;
/* Asks the appliance's bind_driver to release the printer's USB/IP lock.
 * Returns 0 when it reported success, else -1. */
int32_t XAVOPrinterUsbipLockRelease(const char *szPrinterId) XAVOPRINTER_NOEXCEPT;

#ifdef __cplusplus
}
#endif

#endif /* XAVOPRINTER_H */
