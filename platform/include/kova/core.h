/**
 * @file
 * Core platform operations: error register, key/value files, plain files, locks, processes, strings and containers.
 *
 * Conventions of every call here:
 *  - texts are NUL-terminated, sizes are in bytes and count the terminator;
 *  - a bad argument (NULL, an empty text, a size below 1) sets 0xD00 and gives the failure value;
 *  - a failure leaves its code in the error register, a success never touches the register;
 *  - nothing is logged, unless commands are traced (see KLIBCExec); nothing aborts; descriptors are close-on-exec;
 *  - calls may be made from several threads, the error register is per thread.
 */
#ifndef KOVA_CORE_H
#define KOVA_CORE_H

#include <stddef.h>
#include <stdint.h>
#include <stdio.h>
#include <sys/types.h>

#pragma GCC visibility push(default)
#ifdef __cplusplus
extern "C" {
#endif

/** A growable list of texts. The two leading words may be read by callers; everything behind them is private. */
typedef struct KLIBSZLIST {
    uint32_t nCapacity; /**< entries there is room for */
    uint32_t nItem;     /**< entries in use */
    char **ppszItem;    /**< private */
} KLIBSZLIST;

/** A map from text to text that remembers the order in which keys were first set. Opaque. */
typedef struct KLIBSZHASH KLIBSZHASH;

/* ---- error register ------------------------------------------------------------------------------------------- */

/**
 * Writes the calling thread's error register.
 * @param code    32-bit error code (0xD00, 0x200 ...)
 * @param szFile  name of the reporting unit; kept by pointer, so it must outlive the register (a literal). NULL reads
 * as ""
 * @param line    line within that unit
 */
void KLIBCErrSetEx(uint32_t code, const char *szFile, int line);
/** @return the code last set on this thread, 0 when none was */
uint32_t KLIBCErrGet(void);
/** @return the unit last set on this thread, "" when none was */
const char *KLIBCErrorGetFile(void);
/** @return the line last set on this thread, 0 when none was */
int KLIBCErrorGetLine(void);

/* ---- key/value files ------------------------------------------------------------------------------------------ */

/**
 * Reads one key of a key/value file: the first line that begins with the key directly followed by "=".
 * CR and LF at the end and one pair of surrounding double quotes are dropped. A line is looked at up to 65536 bytes.
 * @param szPath   the file
 * @param szKey    the key, compared exactly
 * @param szValue  receives the value, cut to the buffer, always terminated; set to "" when the key is absent or the
 *                 file cannot be read
 * @param cbValue  size of szValue
 * @param flags    must be 0
 * @return above 0: found, also for an empty value; 0: absent (register untouched); below 0: bad argument (0xD00), or
 * the file is missing, unreadable or no regular file (0x900)
 */
int KLIBCFileGetKeyValue(const char *szPath, const char *szKey, char *szValue, int cbValue, int flags);

/**
 * Sets one key: replaces the first line of the key, drops later lines of it, or appends the line; every other line, the
 * mode and the owner are kept. The file is created (0644) when absent. The rewrite goes through a temporary file beside
 * the target that is synced and renamed, serialised against other writers of the same file, so that a reader or a crash
 * finds the old file or the new one, whole. Nothing is written when the file already says so. Files touched: the
 * target, ".<name>.<hash>" beside it, /run/lock/kova/write-<hash>; other writers are waited for up to 30 seconds.
 * @param szPath    the file, at most 64 MiB; a symbolic link is followed to the file it names
 * @param szKey     the key: not empty, without "=" at its start, newline or other control characters
 * @param szValue   the value, stored verbatim; one with CR or LF is refused (0xD00)
 * @param szFormat  "%s=\"%s\"\n" or "%s=%s\n"; anything else is refused (0xD00)
 * @return 0; -1 with 0xD00 bad argument, 0x200 memory, 0x400 writers' lock, 0x900 open, create or read, 0xB00 write or
 * sync, 0x2800 rename
 */
int KLIBCFileSetKeyValue(const char *szPath, const char *szKey, const char *szValue, const char *szFormat);

/**
 * Sets the keys of one map and removes the keys of another in one rewrite, with the guarantees of KLIBCFileSetKeyValue.
 * A key in both maps is set. New keys are appended in the order of the map.
 * @param szPath    the file
 * @param pSet      keys to set with their values, or NULL
 * @param pRemove   keys to remove (values ignored), or NULL
 * @param szFormat  as KLIBCFileSetKeyValue
 * @return 0 or -1 with the codes of KLIBCFileSetKeyValue
 */
int KLIBCFileSetKeys(const char *szPath, const KLIBSZHASH *pSet, const KLIBSZHASH *pRemove, const char *szFormat);

/**
 * Removes every line of a key. A key that itself holds "=" matches a line that begins with it and goes on with "," or
 * ends there.
 * @return 0, also when the key or the file is absent (nothing is created then); -1 as KLIBCFileSetKeyValue
 */
int KLIBCFileRemoveKey(const char *szPath, const char *szKey);

/**
 * Compares a key's value exactly.
 * @param flags  must be 0
 * @return 1 equal; 0 different or absent; below 0 as KLIBCFileGetKeyValue
 */
int KLIBCFileCheckKeyValue(const char *szPath, const char *szKey, const char *szExpected, int flags);

/** Sets a key of /etc/kovainfo.conf with the line format "%s=\"%s\"\n". @return as KLIBCFileSetKeyValue */
int KLIBCINFOSetKeyValue(const char *szKey, const char *szValue);
/** Removes a key of /etc/kovainfo.conf. @return as KLIBCFileRemoveKey */
int KLIBCINFORemoveKey(const char *szKey);

/* ---- plain files and directories ------------------------------------------------------------------------------ */

/** @return 1 when something exists at the path (links followed), else 0 */
int KLIBCFileExist(const char *szPath);
/** @return 1 when the path is an existing directory (links followed), else 0 */
int KLIBCFileCheckDir(const char *szPath);
/**
 * Creates an empty file (0644) when nothing is there; locks and files touched as KLIBCFileSetKeyValue.
 * @return 0; -1 as KLIBCFileSetKeyValue, also (0x900) when the path is a directory
 */
int KLIBCFileTouch(const char *szPath);

/**
 * Appends the names in a directory to a list, sorted, without entries that begin with a dot.
 * @param szDir     the directory
 * @param pList     receives the names
 * @param szPrefix  only names that begin with it, or NULL
 * @param flags     64: entries of any type; 1154: regular files only
 * @return number of names appended; below 0 with 0xD00, 0x900 (cannot be opened) or 0x200
 */
int KLIBCFileEnumDir(const char *szDir, KLIBSZLIST *pList, const char *szPrefix, int flags);

/**
 * Copies the first line that begins with a text, whole, without its newline, cut to the buffer.
 * @param flags  2: begins with; 1026: begins with, followed by "," or the line's end
 * @return above 0 found; 0 no such line (szLine is ""); below 0 with 0xD00 or 0x900
 */
int KLIBCFileGetLine(const char *szPath, const char *szPrefix, char *szLine, int cbLine, int flags);

/**
 * Appends every line of a file, without its newline and cut at 65536 bytes, to a list.
 * @return number of lines; below 0 with 0xD00, 0x900, 0x200
 */
int KLIBCFileReadLines(const char *szPath, KLIBSZLIST *pList);

/**
 * Adds a line behind the first line equal to the marker, or at the end when the marker is NULL or not there; creates
 * the file. The rewrite has the guarantees of KLIBCFileSetKeyValue.
 * @param szLine  the line, with or without its newline
 * @param flags   0 or 512, alike
 * @return 0; -1 as KLIBCFileSetKeyValue
 */
int KLIBCFileAddLine(const char *szPath, const char *szMarker, const char *szLine, int flags);

/**
 * Replaces every occurrence of a text (not empty) in a file.
 * @return 0; -1 as KLIBCFileSetKeyValue, a missing file included
 */
int KLIBCFileReplaceSubStr(const char *szPath, const char *szOld, const char *szNew);

/**
 * Makes a unique file from a template and opens it for writing.
 * @param szTemplate  a path that ends in "XXXXXX"; rewritten in place to the name made. The file has mode 0600
 * @return the stream, or NULL with 0xD00 or 0x900
 */
FILE *KLIBCFileTempFileOpen(char *szTemplate);

/** Gives a unique path beside a target without making a file. @return 0; -1 with 0xD00 (also: buffer too small) */
int KLIBCFileITmpName(const char *szTarget, char *szTmp, int cbTmp);

/* ---- locks ---------------------------------------------------------------------------------------------------- */

/**
 * Takes a named lock. Counted per process and name: asked again while held it succeeds at once and keeps the stronger
 * mode; a shared lock asked for as exclusive upgrades, waiting for other holders. The lock of a dead process is free; a
 * forked child neither holds nor releases its parent's. Files: /run/lock/kova/<name in hexadecimal>, made by root and
 * readable by all, so that everybody can take a shared lock; an unprivileged process is given one without a file while
 * there is none yet, as nobody has asked for that lock since the start of the system.
 * @param lock  upper bits the name, lowest byte the mode: 5 shared, 6 exclusive (0x105, 0x106, 0x805 ...)
 * @param wait  longest wait in seconds
 * @return 0; -1 with 0xD00 (mode), or 0x400 (not free in time, or the lock file cannot be opened)
 */
int KLIBCFileLock(uint32_t lock, int wait);
/** Undoes one KLIBCFileLock of that name (0x100, 0x800 ...); harmless when it is not held. @return 0; -1 with 0xD00 */
int KLIBCFileUnlock(uint32_t name);

/**
 * Locks one file through a lock file derived from its path (/run/lock/kova/file-<hash>), so that the file may be
 * replaced meanwhile. Independent of the lock that rewrites of the file take.
 * @param szPath   the file
 * @param mode     1 exclusive, 0 shared
 * @param seconds  longest wait
 * @param pFd      receives the descriptor to give back
 * @return 0; -1 with 0xD00 or 0x400; *pFd is -1 then
 */
int KLIBCFileLockTimeByFile(const char *szPath, int mode, int seconds, int *pFd);
/** Releases such a lock and closes its descriptor. @return 1; 0 with 0xD00 for a descriptor that is not open */
int KLIBCFileUnlockByFile(int fd);

/* ---- processes ------------------------------------------------------------------------------------------------ */

/**
 * Runs a program and waits for it: no shell, standard streams on /dev/null, every other descriptor closed, signal mask
 * and ignored signals reset. Costs the same whatever the caller's memory. A caller that ignores SIGCHLD or sets
 * SA_NOCLDWAIT has that put aside while a program runs, so that the status is known. With trace_commands="yes" in
 * /etc/kova/platform.conf every program is logged at LOG_DEBUG as "run: /sbin/ip link ... -> 0".
 * @param szProgram  absolute path
 * @param szArg1, szArg2, szArg3, szArg4  arguments, the first NULL ends them
 * @return exit status; 127 with 0x2A00 and errno when it cannot be executed; 128 + signal when killed; -1 with 0xD00,
 *         0x200 or 0x2A00 (errno says why) when no process could be made or another part of the caller's process took
 *         its status
 */
int KLIBCExec(const char *szProgram, const char *szArg1, const char *szArg2, const char *szArg3, const char *szArg4);
/** The same with flags 0xBB (the only value, else 0xD00) and a NULL-terminated list of arguments (const char *). */
int KLIBCExecl(const char *szProgram, int flags, ...);
/**
 * The same with an argument vector, argv[0] included, NULL-terminated.
 * @param wait  1: wait and give the status; 0: return at once (0, or 127 / -1), the child is not left as a zombie
 */
int KLIBCExecv(const char *szProgram, const char *const *ppszArg, int wait);

/**
 * Runs a program and gives its standard output to read; standard input and error are /dev/null.
 * @param szMode  "r", the only one
 * @param ...     arguments (const char *), NULL-terminated, without argv[0]
 * @return the stream, or NULL with 0xD00, 0x200 or 0x2A00 (also when the program cannot be executed)
 */
FILE *KLIBCPopen(const char *szProgram, const char *szMode, ...);
/** Closes such a stream and waits. @return as KLIBCExec; -1 with 0xD00 for a stream that is not one of these */
int KLIBCPclose(FILE *pStream);

/**
 * Finds processes by name (the last path component of the executable, or of a script run by an interpreter).
 * @param pPid   receives process ids, or NULL
 * @param cPid   entries in pPid
 * @param flags  0
 * @return number found (may exceed cPid), zombies not counted; below 0 with 0xD00 or 0x900
 */
int KLIBCPs(const char *szName, pid_t *pPid, int cPid, int flags);
/** @return the pid in a pid file; 0 when the file is absent or holds none; -1 with 0xD00 */
int KLIBCReadPidFile(const char *szPath);
/**
 * Copies the name of a process (last path component, cut to the buffer).
 * @return 0; -1 with 0xD00, or 0xBC00 no such process
 */
int KLIBCProcGetByPid(pid_t pid, char *szName, int cbName);
/**
 * Whether a process runs; one that is on its way to the background is not missed.
 * @param szProc  digits: a pid; anything else: the beginning of a command line up to the end of one of its arguments,
 *                with or without an interpreter before it
 * @return 1 when such a process lives (zombies and the caller excepted), else 0
 */
int KLIBCIsProcAlive(const char *szProc);
/**
 * Sends a signal to what KLIBCIsProcAlive matches, once to each of the first 64.
 * @return 0, also when there is nothing to kill; -1 with 0xD00 or 0x8100
 */
int KLIBCKill(const char *szProc, int signal);

/* ---- strings, lists, maps ------------------------------------------------------------------------------------- */

/** @param capacity entries to make room for, above 0. @return an empty list, or NULL with 0xD00 or 0x200 */
KLIBSZLIST *KLIBCSzListAlloc(int capacity);
/**
 * Appends a copy of a text, "" included; the list grows as needed, its handle never moves.
 * @return 0; -1 with 0xD00 or 0x200
 */
int KLIBCSzListPush(KLIBSZLIST **ppList, const char *szItem);
/** @return the text at an index from 0, NULL past the end (owned by the list) */
const char *KLIBCSzListGet(const KLIBSZLIST *pList, int index);
/** @return index of the first equal entry, -1 when there is none (register untouched) */
int KLIBCSzListFind(const KLIBSZLIST *pList, const char *szItem);
/** Empties a list; NULL is allowed. */
void KLIBCSzListRemoveAll(KLIBSZLIST *pList);
/** Frees a list; NULL is allowed. */
void KLIBCSzListFree(KLIBSZLIST *pList);

/** @param capacity entries to make room for, above 0. @return an empty map, or NULL with 0xD00 or 0x200 */
KLIBSZHASH *KLIBCSzHashAlloc(int capacity);
/**
 * Sets a key (not empty); copies both, a present key keeps its place.
 * @return 0; -1 with 0xD00 or 0x200, the map as before
 */
int KLIBCSzHashSetValue(KLIBSZHASH *pHash, const char *szKey, const char *szValue);
/** @return the value of a key (owned by the map), NULL when absent */
const char *KLIBCSzHashGetValue(const KLIBSZHASH *pHash, const char *szKey);
/** Appends the keys to a list in the order in which they were first set. @return number of keys; -1 with 0xD00 or 0x200
 */
int KLIBCSzHashEnumKey(const KLIBSZHASH *pHash, KLIBSZLIST *pList);
/** Frees a map; NULL is allowed. */
void KLIBCSzHashFree(KLIBSZHASH *pHash);

/** Next token, like strtok_r. @param szText the text to cut up at the first call, then NULL */
char *KLIBCStrTok(char *szText, const char *szDelimiters, char **ppSave);
/**
 * Next field between separators, empty fields kept, like strsep with the position in *ppSave.
 * @param szText as KLIBCStrTok
 */
char *KLIBCStrSep(char *szText, const char *szSeparators, char **ppSave);
/** The index-th (from 0) blank-separated token, terminated in place. @return NULL when there are fewer tokens */
char *KLIBCStrTokIndex(char *szText, int index);
/**
 * Copies without leading and trailing white space.
 * @param szOut as large as szText, may be szText itself.
 * @return szOut, NULL with 0xD00
 */
char *KLIBCStrTrimSpace(const char *szText, char *szOut);

/** realloc that frees the old block when growing fails. */
void *reallocf(void *pBlock, size_t cb);

/* ---- system ---------------------------------------------------------------------------------------------------- */

/**
 * @return 1 when a kernel module is loaded or built in, 0 when not; -1 with 0xD00 or 0x900 (the module list is
 *         unreadable)
 */
int KLIBCModuleIsLoad(const char *szModule);
/** @return 1 on a machine with two controllers (support_dualhead="yes" in /etc/kova/platform.conf), else 0 */
int KLIBCSupportDualhead(void);

/**
 * Ciphers a buffer with the machine's key (/etc/kova/secret.key, made at first use, 0600). Its own inverse; keeps the
 * length, makes no zero byte from a text and no other from a zero, pads the rest of the output with zeros. The key is
 * made under the locks of KLIBCFileSetKeyValue.
 * @param cbIn   0 or more
 * @param cbOut  at least cbIn; pOut may be pIn
 * @return 0; -1 with 0xD00, 0x900 (no key) or 0xB00 (the key cannot be stored)
 */
int KLIBCCryptBufCrypt(const void *pIn, int cbIn, void *pOut, int cbOut);

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
