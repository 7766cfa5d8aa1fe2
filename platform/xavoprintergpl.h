/*
 * xavoprintergpl.h - the appliance's printer helper library,
 * libxavoprintergpl.so.6.
 */
#ifndef XAVOPRINTERGPL_H
#define XAVOPRINTERGPL_H

#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

/* Copies the printer's stored device ID string into szBuf; 0 on success. */
int32_t XAVOPrinterGPLConfStringIdGet(const char *szPrinterId, char *szBuf, int32_t cbBuf);

#ifdef __cplusplus
}
#endif

#endif /* XAVOPRINTERGPL_H */
