/*
 * xavocore.h - the appliance's core platform library, libxavocore.so.6:
 * last error, string lists and hashes, section and key-value files, locks,
 * processes, services, string helpers and the cipher.
 *
 * This is the one door from the printer library to the core.  Sizes are
 * signed 32-bit byte counts, results signed 32-bit unless said otherwise.
 * Compiles as C99 and as C++.
 */
#ifndef XAVOCORE_H
#define XAVOCORE_H

#include <stddef.h>
#include <stdint.h>
#include <stdio.h>

#ifdef __cplusplus
extern "C" {
#endif

/* ---- last error ---- */
void ORLICErrSetEx(uint32_t uCode, const char *szFile, int32_t iLine);
uint32_t ORLICErrGet(void);
const char *ORLICErrorGetFile(void);
int32_t ORLICErrorGetLine(void);

/* ---- string lists ----
 * The record is read directly by callers: the item count is the second
 * 32-bit word, and the item pointers start at the seventh 32-bit word, on
 * 32-bit and 64-bit builds alike.  The list may move when it grows, which is
 * why pushing takes the list's address. */
typedef struct ORLICSzList {
    int32_t iCapacity;    /* word 0: item slots allocated */
    int32_t iCount;       /* word 1: items in use */
    int32_t aiReserved[4]; /* words 2-5: the core's own */
    /* word 6 on: char *apszItem[iCapacity] */
} ORLICSzList;

#define ORLIC_SZLIST_ITEMS(pList) ((char **)(void *)((char *)(pList) + 6 * sizeof(int32_t)))
#define ORLIC_SZLIST_COUNT(pList) ((pList)->iCount)

ORLICSzList *ORLICSzListAlloc(int32_t iCapacity);
int32_t ORLICSzListPush(ORLICSzList **ppList, const char *sz);
/* The item's text, or NULL when the index is out of range. */
const char *ORLICSzListGet(const ORLICSzList *pList, int32_t iIndex);
void ORLICSzListFree(ORLICSzList *pList);

/* ---- string hashes ---- */
typedef struct ORLICSzHash ORLICSzHash;

ORLICSzHash *ORLICSzHashAlloc(int32_t iCapacity);
int32_t ORLICSzHashSetValue(ORLICSzHash **ppHash, const char *szKey, const char *szValue);
const char *ORLICSzHashGetValue(const ORLICSzHash *pHash, const char *szKey);
int32_t ORLICSzHashRemoveKey(ORLICSzHash *pHash, const char *szKey);
/* Appends every key to the list; the number of keys, or negative. */
int32_t ORLICSzHashEnumKey(const ORLICSzHash *pHash, ORLICSzList **ppList);
void ORLICSzHashFree(ORLICSzHash *pHash);

/* ---- section files ([name] headers, key lines) ---- */
int32_t ORLICFileGetSection(const char *szPath, const char *szSection, ORLICSzHash **ppHash);
int32_t ORLICFileAddSection(const char *szPath, const char *szSection, const ORLICSzHash *pHash,
                            const char *szLineFormat);
int32_t ORLICFileSetSection(const char *szPath, const char *szOldSection, const char *szNewSection,
                            const ORLICSzHash *pHash, const char *szLineFormat);
int32_t ORLICFileGetSectionValue(const char *szPath, const char *szSection, const char *szKey,
                                 char *szBuf, int32_t cbBuf);
int32_t ORLICFileSetSectionValue(const char *szPath, const char *szSection, const char *szKey,
                                 const char *szValue);

/* ---- key-value files (key="value" lines) ---- */
int32_t ORLICFileGetKeyValue(const char *szPath, const char *szKey, char *szBuf, int32_t cbBuf,
                             uint32_t uFlags);
int32_t ORLICFileSetKeyValue(const char *szPath, const char *szKey, const char *szValue,
                             const char *szLineFormat);
int32_t ORLICFileRemoveKey(const char *szPath, const char *szKey);
int32_t ORLICFileGetPair(const char *szPath, ORLICSzHash **ppHash);

/* ---- files and locks ---- */
int32_t ORLICFileExist(const char *szPath);
FILE *ORLICFileTempFileOpen(char *szTemplate);
int32_t ORLICFileLockByFile(const char *szPath, int32_t iFlags, int32_t *pfdLock);

/* Appliance-wide named locks. */
#define ORLIC_LOCK_USBIDMAP 0x20000u
int32_t ORLICFileLock(uint32_t uLockAndFlags, int32_t iTimeout);
int32_t ORLICFileUnlock(uint32_t uLock);

/* ---- processes and services ---- */
int32_t ORLICExec(const char *szProgram, const char *szArg1, const char *szArg2, const char *szArg3,
                  const char *szArg4);
/* Arguments after the option word are texts ended by a NULL. */
int32_t ORLICExecl(const char *szProgram, uint32_t uOptions, ...);
int32_t ORLICExecv(const char *szProgram, char *const apszArgv[], int32_t blWait);
/* Arguments after the mode are texts ended by a NULL; the program path is
 * not repeated among them. */
FILE *ORLICPopen(const char *szProgram, const char *szMode, ...);
int32_t ORLICPclose(FILE *pStream);
int32_t ORLICIsProcAlive(const char *szProcName);
int32_t ORLIServiceIsRunning(const char *szService);
int32_t ORLIServiceStart(const char *szService, int32_t iFlags);

/* ---- string helpers ---- */
char *ORLICStrTrim(char *sz, int32_t iReserved1, int32_t iReserved2);
int32_t ORLICStrSep(const char *sz, const char *szDelims, ORLICSzList **ppList);
int32_t ORLICStrTok(const char *sz, const char *szDelims, ORLICSzList **ppList);
char *ORLICStrCaseLower(const char *szSrc, int32_t iReserved, char *szDst, int32_t cbDst);
int32_t ORLICStrCat(char **ppsz, int32_t *pcbAlloc, const char *szPiece);
int32_t ORLICStrReplace(const char *szSrc, const char *szOld, const char *szNew, char *szDst,
                        int32_t cbDst);

/* ---- cipher: text in, text out; non-zero on success ---- */
int32_t ORLICCryptSzEncrypt(const char *szClear, char *szOut, int32_t cbOut);
int32_t ORLICCryptSzDecrypt(const char *szCipher, char *szOut, int32_t cbOut);

#ifdef __cplusplus
}
#endif

#endif /* XAVOCORE_H */
