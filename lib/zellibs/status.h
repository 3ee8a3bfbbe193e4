// The statuses that the library answers with.
#pragma once

#include "zellibs.h"

#define KIF_STATUS_OK 0u
#define KIF_STATUS_FAILURE 0xbad0001u
#define KIF_STATUS_NOT_FOUND 0xbad0003u
#define KIF_STATUS_NOT_SUPPORTED 0xbad0004u
#define KIF_STATUS_BAD_PARAMETER 0xbad0007u
#define KIF_STATUS_NO_PERMISSION 0xbad000fu
#define KIF_STATUS_IO_ERROR 0xbad0010u
#define KIF_STATUS_TOO_LARGE 0xbad0011u
#define KIF_STATUS_NO_MEMORY 0xbad0014u
#define KIF_STATUS_NO_RESOURCES 0xbad0017u
#define KIF_STATUS_NO_HOST 0xbad0040u
#define KIF_STATUS_NO_CACHE_FILE 0xbad0041u  // there is no file of that name
#define KIF_STATUS_NOT_A_CACHE_FILE 0xbad0042u
#define KIF_STATUS_DAMAGED_CACHE_FILE 0xbad0043u
#define KIF_STATUS_CACHE_VERSION 0xbad0044u
#define KIF_STATUS_COMPRESSED_CACHE_FILE 0xbad0045u
#define KIF_STATUS_NO_COMMAND_LINE 0xbad0062u

// The status for a failed system call: gone (ENOENT, ESRCH, ENODEV, ENXIO) is not found, EACCES and
// EPERM are no permission, ENOMEM is out of memory, EFBIG too large, and anything else an
// input/output error.
KIF_Status StatusOfErrno(int error);
