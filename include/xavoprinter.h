/*
 * xavoprinter.h - public interface of libxavoprinter.so.6, the printer
 * management library of the appliance.
 *
 * Every function returns a signed 32-bit result (0 on success, -1 on
 * failure unless its description says otherwise) and reports the reason of a
 * failure through the platform's last error (ORLICErrGet and friends,
 * declared in xavocore.h).  Records are plain fixed-size structures
 * owned by the caller; the library never keeps a pointer to them past the
 * call.  The header compiles as C99 and as C++.
 */
#ifndef XAVOPRINTER_H
#define XAVOPRINTER_H

#include <stddef.h>
#include <stdint.h>

#include "xavocore.h"

/* The operations never throw; C++ callers may rely on it. */
#if defined(__cplusplus)
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

/* A USB printer's section of the printer configuration file. */
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

/* A network printer's configuration. */
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

/* What identification learned of a network printer. */
typedef struct NetPrinterInfo {
    char szIP[16];
    char szBackend[1024];
    char szQName[1024];
    char szBrand[1024];
    char szModel[1024];
    char szStringId[1024];
} NetPrinterInfo;

/* The cloud print account, in clear. */
typedef struct PrinterGoogleInfo {
    char szAccount[255];
    char szPassword[128];
    char szRefreshToken[256];
} PrinterGoogleInfo;

/* Record layouts are part of the ABI: pin them. */
#if defined(__cplusplus)
#define XAVO_STATIC_ASSERT(c, m) static_assert(c, m)
#else
#define XAVO_STATIC_ASSERT(c, m) _Static_assert(c, m)
#endif
XAVO_STATIC_ASSERT(sizeof(UsbPrinterConf) == 2208, "UsbPrinterConf size");
XAVO_STATIC_ASSERT(offsetof(UsbPrinterConf, szMode) == 8, "szMode offset");
XAVO_STATIC_ASSERT(offsetof(UsbPrinterConf, szPrinterId) == 136, "szPrinterId offset");
XAVO_STATIC_ASSERT(offsetof(UsbPrinterConf, szProductName) == 392, "szProductName offset");
XAVO_STATIC_ASSERT(offsetof(UsbPrinterConf, szDriverBrand) == 664, "szDriverBrand offset");
XAVO_STATIC_ASSERT(offsetof(UsbPrinterConf, szUsblpStringId) == 920, "szUsblpStringId offset");
XAVO_STATIC_ASSERT(offsetof(UsbPrinterConf, szBrand) == 1944, "szBrand offset");
XAVO_STATIC_ASSERT(offsetof(UsbPrinterConf, szFitToPage) == 2200, "szFitToPage offset");
XAVO_STATIC_ASSERT(sizeof(NetPrinterConf) == 4136, "NetPrinterConf size");
XAVO_STATIC_ASSERT(offsetof(NetPrinterConf, szCupsPrinterName) == 16, "szCupsPrinterName offset");
XAVO_STATIC_ASSERT(offsetof(NetPrinterConf, abReserved) == 672, "reserved block offset");
XAVO_STATIC_ASSERT(offsetof(NetPrinterConf, szDriverBrand) == 2720, "szDriverBrand offset");
XAVO_STATIC_ASSERT(offsetof(NetPrinterConf, szStringId) == 2976, "szStringId offset");
XAVO_STATIC_ASSERT(offsetof(NetPrinterConf, szPrinterId) == 4000, "szPrinterId offset");
XAVO_STATIC_ASSERT(offsetof(NetPrinterConf, szFitToPage) == 4128, "szFitToPage offset");
XAVO_STATIC_ASSERT(sizeof(NetPrinterInfo) == 5136, "NetPrinterInfo size");
XAVO_STATIC_ASSERT(offsetof(NetPrinterInfo, szBackend) == 16, "szBackend offset");
XAVO_STATIC_ASSERT(offsetof(NetPrinterInfo, szStringId) == 4112, "szStringId offset");
XAVO_STATIC_ASSERT(sizeof(PrinterGoogleInfo) == 639, "PrinterGoogleInfo size");
XAVO_STATIC_ASSERT(offsetof(PrinterGoogleInfo, szPassword) == 255, "szPassword offset");
XAVO_STATIC_ASSERT(offsetof(PrinterGoogleInfo, szRefreshToken) == 383, "szRefreshToken offset");

/* ---- printer configuration and lock ---- */
int32_t XAVOPrinterPrinterConfLock(void) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterPrinterConfUnlock(int32_t fdLock) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterConfSetup(const UsbPrinterConf *pPrinterConf, int32_t blWriteEmpty) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterCupsNameGet(const char *szPrinterId, char *szBuf, int32_t cbBuf) XAVOPRINTER_NOEXCEPT;

/* ---- device ID strings ----
 * The device ID string is writable: the appliance's callers hand in their own
 * buffers, and the contract allows the search to mark its place in it. */
int32_t XAVOPrinterConfStringIdParse(char *szStringId, const char *szType, char *szBuf, int32_t cbBuf) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterConfStringIdGetVendor(char *szStringId, char *szBuf, int32_t cbBuf) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterConfStringIdGetModel(char *szStringId, char *szBuf, int32_t cbBuf) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterConfStringIdGetCmd(char *szStringId, char *szBuf, int32_t cbBuf) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterModelDetect(UsbPrinterConf *pPrinterConf) XAVOPRINTER_NOEXCEPT;

/* ---- USB device access ---- */
int32_t XAVOPrinterDevOpen(const char *szDevName, int32_t nRetry) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterGetStringId(const char *szDevName, char *szBuf, int32_t cbBuf) XAVOPRINTER_NOEXCEPT;
int32_t XAVOResetPrinter(const char *szDevName) XAVOPRINTER_NOEXCEPT;

/* ---- USB printer listing and counting ---- */
int32_t XAVOPrinterUsbtabEnum(char ***pppszDevNames, int32_t *piCount) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterProcUsbtabIdEnum(ORLICSzList **ppList) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterEnumCount(int32_t iType, ORLICSzList **ppList) XAVOPRINTER_NOEXCEPT;

/* ---- USB enable and disable ---- */
int32_t XAVOPrinterEnableExt(int32_t action, const char *szDevName, const char *szBusId) XAVOPRINTER_NOEXCEPT;

/* ---- network printer table and records ---- */
int32_t XAVOPrinterNetUpdateConf(int32_t iAction, const NetPrinterConf *pNPConf) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterNetNptabEnum(ORLICSzList **ppList) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterNetConfSetup(const NetPrinterConf *pNPConf, int32_t blWriteEmpty) XAVOPRINTER_NOEXCEPT;

/* ---- network identification and reachability ---- */
int32_t XAVOPrinterNetGetStringId(const char *szIP, char *szOutBuf, int32_t iOutSize) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterNetGetStringBackend(const char *szIP, char *szBackend, uint32_t cbBackend,
                                       char *szQName, uint32_t cbQName) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterNetInfoGetByIP(const char *szIP, NetPrinterInfo *pNPInfo) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterNetAvahiInfoGet(const char *szIP, NetPrinterInfo *pNPInfo) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterNetBjnpInfoGet(const char *szIP, NetPrinterInfo *pNPInfo) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterNetPingStatus(const char *szIP, char *szStatus, int32_t cbStatus) XAVOPRINTER_NOEXCEPT;

/* ---- CUPS queues ---- */
int32_t XAVOPrinterCupsAdd(const char *szPrinterId, const char *szPpdFile) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterCupsPrinterEnable(const char *szCupsPrinterName, int32_t blEnable) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterCupsNameCheck(const char *szPrinterId, const char *szCupsPrinterName) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterNetCupsAdd(const NetPrinterConf *pNPConf, const char *szPpdFile) XAVOPRINTER_NOEXCEPT;
/* Returns a heap text that the caller releases with free(), or NULL. */
char *XAVOCupsGetPPD(const char *szPpdName) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterCupsRm(const char *szPrinterId) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterCupsRmByName(const char *szCupsPrinterName) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterNetCupsRm(const char *szPrinterId) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterCupsUsbConfRmAll(void) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterNetIPCheck(const char *szIP) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterNetCupsNameAndIPCheck(const char *szIP, const char *szCupsPrinterName) XAVOPRINTER_NOEXCEPT;

/* ---- printing and jobs ---- */
int32_t XAVOPrinterCupsPrintFile(const char *szPrinterId, const char *szFile, const char *szTitle,
                                 int32_t blRemove) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterCupsPrintTestPage(const char *szPrinterId) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterCupsJobWaitComplete(const char *szPrinterId, const char *szJobId) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterQueueGet(const char *szPrinterId, char *szBuf, int32_t cbBuf) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterCleanSpool(void) XAVOPRINTER_NOEXCEPT;

/* ---- sharing services ---- */
int32_t XAVOPrinterIsActive(void) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterGoogleInfoGet(PrinterGoogleInfo *pInfo) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterGoogleInfoSet(const PrinterGoogleInfo *pInfo) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterUsbipEject(const char *szPrinterId) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterUsbipGetLockStatus(const char *szPrinterId, char *szBuf, int32_t cbBuf) XAVOPRINTER_NOEXCEPT;
int32_t XAVOPrinterUsbipLockRelease(const char *szPrinterId) XAVOPRINTER_NOEXCEPT;

#ifdef __cplusplus
}
#endif

#endif /* XAVOPRINTER_H */
