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

/* ---- last error ----
 * One per thread: a caller reads it back right after the call that failed. */
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

/* ---- string hashes ----
 * Keys compare exactly; keys enumerate in the order they were first set.
 * The hash may move when it grows (hence the address in SetValue); a value
 * the caller holds stays valid until its own key is set again or removed. */
typedef struct ORLICSzHash ORLICSzHash;

ORLICSzHash *ORLICSzHashAlloc(int32_t iCapacity);
int32_t ORLICSzHashSetValue(ORLICSzHash **ppHash, const char *szKey, const char *szValue);
const char *ORLICSzHashGetValue(const ORLICSzHash *pHash, const char *szKey);
int32_t ORLICSzHashRemoveKey(ORLICSzHash *pHash, const char *szKey);
/* Appends every key to the list; the number of keys, or negative. */
int32_t ORLICSzHashEnumKey(const ORLICSzHash *pHash, ORLICSzList **ppList);
void ORLICSzHashFree(ORLICSzHash *pHash);

/* ---- section files ([name] headers, key lines) ----
 * Read as Samba reads smb.conf: blank lines and comments (# ;) skipped,
 * blanks around "=" and around values dropped, a section name is the text
 * between the first "[" and the last "]" of its header line.  Writers
 * replace the file atomically (an existing file keeps its mode and owner;
 * a symlink at the path is refused, never followed) and touch no other
 * section.  Writers of key-value files alike hold the file's write lock
 * (flock on "." name ".lock" beside it) from their read to their replace,
 * so that writers in several processes lose nothing; readers take none.
 * In a directory others can write to (/tmp), a file that is not root's
 * (another owner, writable by others, a link, a FIFO) reads as missing and
 * is replaced by root's own 0644 file.  A control character in a value is written as a blank; a
 * section name or key holding one is refused (negative, ERR_BAD_PARAMETERS).
 *
 * GetSection: the number of key lines read into the hash; negative when the
 *   file or section is missing (the hash is then untouched).
 * AddSection: 1 added (a missing file is created); 0 the section exists and
 *   nothing was written; negative on failure.
 * SetSection: 1 replaced (or added when the old name is missing); negative
 *   on failure.
 * GetSectionValue: the length copied (cut to fit); negative when the file,
 *   section (ERR_NOT_FOUND) or key (ERR_KEY_NOT_FOUND) is missing.
 * SetSectionValue: 0; negative on failure or when the file or section is
 *   missing (the line is written as "	%s = %s
"). */
int32_t ORLICFileGetSection(const char *szPath, const char *szSection, ORLICSzHash **ppHash);
int32_t ORLICFileAddSection(const char *szPath, const char *szSection, const ORLICSzHash *pHash,
                            const char *szLineFormat);
int32_t ORLICFileSetSection(const char *szPath, const char *szOldSection, const char *szNewSection,
                            const ORLICSzHash *pHash, const char *szLineFormat);
int32_t ORLICFileGetSectionValue(const char *szPath, const char *szSection, const char *szKey,
                                 char *szBuf, int32_t cbBuf);
int32_t ORLICFileSetSectionValue(const char *szPath, const char *szSection, const char *szKey,
                                 const char *szValue);

/* ---- key-value files (key="value" lines) ----
 * Reading returns values without their quotes; a key set twice reads as its
 * last value.  GetKeyValue: the length copied; negative when the file or
 * key (ERR_KEY_NOT_FOUND) is missing.  SetKeyValue: 0, creating a missing
 * file, leaving one line for the key; a value holding a double quote or a
 * control character is refused.  RemoveKey: the number of lines removed (0
 * when the key or the file is not there).  GetPair: the number of pairs;
 * negative when the file is missing, 0 when it is empty. */
int32_t ORLICFileGetKeyValue(const char *szPath, const char *szKey, char *szBuf, int32_t cbBuf,
                             uint32_t uFlags);
int32_t ORLICFileSetKeyValue(const char *szPath, const char *szKey, const char *szValue,
                             const char *szLineFormat);
int32_t ORLICFileRemoveKey(const char *szPath, const char *szKey);
int32_t ORLICFileGetPair(const char *szPath, ORLICSzHash **ppHash);

/* ---- files and locks ----
 * TempFileOpen: a new 0600 file named by the template, locked (flock) for
 * as long as the stream is open; rename it into place before closing the
 * stream.  Files of the same template that nobody holds were left by
 * writers killed before their rename, and are removed first. */
int32_t ORLICFileExist(const char *szPath);
FILE *ORLICFileTempFileOpen(char *szTemplate);
int32_t ORLICFileLockByFile(const char *szPath, int32_t iFlags, int32_t *pfdLock);

/* ORLICFileLockByFile: flag 1 = exclusive.  Never blocks: 1 taken (*pfdLock
 * holds it until closed), 0 held elsewhere, negative when the lock file
 * cannot be opened.
 *
 * Appliance-wide named locks, held by the calling process from
 * ORLICFileLock until ORLICFileUnlock.  The low bits of the first argument
 * are flock(2) bits (0x20006 = LOCK_USBIDMAP, LOCK_EX | LOCK_NB); the
 * second is how many seconds to go on trying.  Both return 0 on success. */
#define ORLIC_LOCK_USBIDMAP 0x20000u
int32_t ORLICFileLock(uint32_t uLockAndFlags, int32_t iTimeout);
int32_t ORLICFileUnlock(uint32_t uLock);

/* ---- processes and services ----
 * Programs run without a shell, with stdin from /dev/null, no descriptor of
 * the caller's but 1 and 2, and the environment PATH and LC_ALL=C.  A
 * result is the program's exit status (0 success, 1..255 failure), 128 + N
 * when signal N killed it, or -1 when it could not be started or waited
 * for; every non-zero result sets ERR_EXEC.  ORLICExec expands an argument
 * that is an absolute path holding '*', '?' or '[' as a file name pattern
 * (kept as it is when nothing matches or a file has that very name).
 * ORLICExecl options: 0x01 wait (else started and reaped in the
 * background, result 0), 0x02 stdout to /dev/null; other bits reserved.
 * ORLICExecv waits when blWait is non-zero.  ORLICPopen supports mode "r";
 * NULL with ERR_EXEC when the program cannot be started.  ORLICPclose:
 * the program's result as above, -1 for a stream ORLICPopen did not give.
 * ORLIServiceIsRunning: 1 running, 0 stopped, -1 unknown service. */
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

/* ---- string helpers ----
 * StrTrim trims in place (the text moves to the buffer's start) and returns
 * the buffer.  StrSep keeps empty fields, StrTok drops them; both return the
 * number of fields appended.  StrCat returns the new length.  StrReplace
 * replaces the first occurrence: the bytes written with the NUL (> 0), 0
 * when the old text does not occur (the source is copied), negative when
 * the result does not fit. */
char *ORLICStrTrim(char *sz, int32_t iReserved1, int32_t iReserved2);
int32_t ORLICStrSep(const char *sz, const char *szDelims, ORLICSzList **ppList);
int32_t ORLICStrTok(const char *sz, const char *szDelims, ORLICSzList **ppList);
char *ORLICStrCaseLower(const char *szSrc, int32_t iReserved, char *szDst, int32_t cbDst);
int32_t ORLICStrCat(char **ppsz, int32_t *pcbAlloc, const char *szPiece);
int32_t ORLICStrReplace(const char *szSrc, const char *szOld, const char *szNew, char *szDst,
                        int32_t cbDst);

/* ---- cipher: text in, text out; non-zero on success ----
 * Authenticated: a changed text fails to decipher.  The output of a clear
 * text of n bytes takes about 4 * (n + 40) / 3 characters (394 for 255). */
int32_t ORLICCryptSzEncrypt(const char *szClear, char *szOut, int32_t cbOut);
int32_t ORLICCryptSzDecrypt(const char *szCipher, char *szOut, int32_t cbOut);

#ifdef __cplusplus
}
#endif

#endif /* XAVOCORE_H */
