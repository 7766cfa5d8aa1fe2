/*
 * xavousb.h - the appliance's USB library, libxavousb.so.6.
 */
#ifndef XAVOUSB_H
#define XAVOUSB_H

#include <stddef.h>
#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

/* Kind flags of a device; the two printer kinds together. */
#define XAVOUSB_KIND_PRINTER_MASK 0x0Cu

/* Device information record: 812 bytes, little-endian.  Bytes not named
 * here are the USB library's own. */
typedef struct XAVOUSBDevInfo {
    uint32_t uKind;              /* offset 0 */
    unsigned char abOwn1[28];
    uint32_t uVendorId;          /* offset 32 */
    uint32_t uProductId;         /* offset 36 */
    unsigned char abOwn2[132];
    char szManufacturer[128];    /* offset 172 */
    char szProduct[128];         /* offset 300 */
    char szSerial[128];          /* offset 428 */
    char szPrinterId[256];       /* offset 556 */
} XAVOUSBDevInfo;

#if defined(__cplusplus)
static_assert(sizeof(XAVOUSBDevInfo) == 812, "XAVOUSBDevInfo size");
static_assert(offsetof(XAVOUSBDevInfo, uVendorId) == 32, "vendor offset");
static_assert(offsetof(XAVOUSBDevInfo, szManufacturer) == 172, "manufacturer offset");
static_assert(offsetof(XAVOUSBDevInfo, szPrinterId) == 556, "printer id offset");
#else
_Static_assert(sizeof(XAVOUSBDevInfo) == 812, "XAVOUSBDevInfo size");
_Static_assert(offsetof(XAVOUSBDevInfo, szPrinterId) == 556, "printer id offset");
#endif

/* With a NULL buffer and size 0, stores the size needed at *pcbNeeded.
 * With a zeroed block of that size, fills it with an array of pointers to
 * device-name texts lying in the same block and returns the device count. */
int32_t XAVOUSBDevEnum(uint32_t uKindMask, void *pBuf, int32_t cbBuf, int32_t *pcbNeeded);
int32_t XAVOUSBDevGetInfo(const char *szDevName, XAVOUSBDevInfo *pInfo);

#ifdef __cplusplus
}
#endif

#endif /* XAVOUSB_H */
