#include "status.h"

#include <errno.h>

#include <iterator>

namespace {

struct StatusText {
  KIF_Status status;
  const char *text;
};

constexpr StatusText kTexts[] = {
    {KIF_STATUS_OK, "Success"},
    {KIF_STATUS_FAILURE, "Failure"},
    {KIF_STATUS_NOT_FOUND, "Not found"},
    {KIF_STATUS_NOT_SUPPORTED, "Not supported"},
    {KIF_STATUS_BAD_PARAMETER, "Bad parameter"},
    {KIF_STATUS_NO_PERMISSION, "No permission"},
    {KIF_STATUS_IO_ERROR, "Input/output error"},
    {KIF_STATUS_TOO_LARGE, "Too large"},
    {KIF_STATUS_NO_MEMORY, "Out of memory"},
    {KIF_STATUS_NO_RESOURCES, "Out of resources"},
    {KIF_STATUS_NO_HOST, "No host"},
    {KIF_STATUS_NO_CACHE_FILE, "No such cache file"},
    {KIF_STATUS_NOT_A_CACHE_FILE, "Not a cache file"},
    {KIF_STATUS_DAMAGED_CACHE_FILE, "Damaged cache file"},
    {KIF_STATUS_CACHE_VERSION, "Cache file of another version"},
    {KIF_STATUS_COMPRESSED_CACHE_FILE,
     "Compressed cache file: gzip -d it, or zcat FILE | zlkkiftools -c /dev/stdin ps"},
    {KIF_STATUS_NO_COMMAND_LINE, "No command line"},
};

}  // namespace

KIF_Status StatusOfErrno(int error) {
  switch (error) {
    case ENOENT:
    case ESRCH:  // a process that ended while its file was open
    case ENOTDIR:
    case ENODEV:
    case ENXIO:
      return KIF_STATUS_NOT_FOUND;
    case EACCES:
    case EPERM:
      return KIF_STATUS_NO_PERMISSION;
    case ENOMEM:
      return KIF_STATUS_NO_MEMORY;
    case EFBIG:
      return KIF_STATUS_TOO_LARGE;
    case EMFILE:
    case ENFILE:
      return KIF_STATUS_NO_RESOURCES;
    default:
      return KIF_STATUS_IO_ERROR;
  }
}

const char *ZLK_ReturnStatusToString(KIF_Status status) {
  for (const StatusText &row : kTexts) {
    if (row.status == status) return row.text;
  }
  return "Unknown status";
}
