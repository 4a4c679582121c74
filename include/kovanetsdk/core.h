/**
 * @file
 * Error codes that the library leaves in the error register (KLIBCErrGet of kova/core.h) when a call fails.
 *
 * A successful call does not clear the register: look at it only after a failure result. A failure whose cause lies in
 * a platform call keeps the code that the platform set.
 */
#ifndef KOVANETSDK_CORE_H
#define KOVANETSDK_CORE_H

/**
 * @defgroup errors Error codes
 * What KLIBCErrGet gives after a failure.
 * @{
 */
#define NET_ERR_UNKNOWN 0x100 /**< a lower step failed without a more specific cause */
#define NET_ERR_OUT_OF_MEMORY                                                                                          \
    0x200                           /**< memory, a list or a map could not be had; a cluster address is not ready yet  \
                                     */
#define NET_ERR_LOCK 0x400          /**< the configuration lock could not be taken */
#define NET_ERR_FILE_OPEN 0x900     /**< a file could not be opened, created or read */
#define NET_ERR_FILE_READ 0xA00     /**< a kernel list file could not be read */
#define NET_ERR_FILE_WRITE 0xB00    /**< writing, flushing or syncing a rewritten file failed */
#define NET_ERR_BAD_PARAMETER 0xD00 /**< an argument is missing, empty, too short or out of its allowed set */
#define NET_ERR_OUT_OF_RANGE 0xE00  /**< an argument is present but not acceptable */
#define NET_ERR_BAD_ADDRESS 0x1000  /**< a text is not a valid address, mask or prefix */
#define NET_ERR_RENAME 0x2800       /**< a rewritten file could not replace the old one */
#define NET_ERR_EXEC 0x2A00         /**< a command failed or could not be started */
#define NET_ERR_SOCKET 0x3400       /**< no socket for interface queries, or the kernel does not know the interface */
#define NET_ERR_IOCTL 0x3600        /**< an interface request on an existing socket failed */
#define NET_ERR_PARSE 0x4000        /**< a line of a kernel or system file could not be parsed */
#define NET_ERR_SYSCALL 0x8100      /**< a host-name or MTU system call failed */
#define NET_ERR_EXISTS 0xBB00       /**< an entry to add to a fixed table is already there */
#define NET_ERR_NOT_FOUND 0xBC00    /**< an entry or interface was not found, or is not of the required kind */
#define NET_ERR_FULL 0xBD00         /**< a fixed table is full */
/** @} */

#endif
