// hardware_chipset_rtc: the hardware clock, which is taken to run in UTC.
#include <errno.h>
#include <fcntl.h>
#include <linux/rtc.h>
#include <sys/ioctl.h>

#include <cstddef>

#include "linux/files.h"
#include "linux/linux_nodes.h"
#include "records/platform.h"

namespace {

constexpr char kDevice[] = "/dev/rtc0";

// What writes to the clock hand in, in this order.
enum Input : uint32_t { kMonth, kDay, kYear, kHour, kMinute, kSecond, kInputs };

KIF_Status ReadDevice(ClockRecord *clock) {
  if (IsForeignRoot()) return KIF_STATUS_NOT_SUPPORTED;
  Descriptor device;
  const KIF_Status status = OpenHostFile(kDevice, O_RDONLY, &device);
  if (status != KIF_STATUS_OK) return status;
  rtc_time time = {};
  if (ioctl(device.fd(), RTC_RD_TIME, &time) != 0) return StatusOfErrno(errno);
  *clock = {time.tm_hour,    time.tm_min,         time.tm_sec, time.tm_mday,
            time.tm_mon + 1, time.tm_year + 1900, {}};
  return KIF_STATUS_OK;
}

// Reads the three numbers of a text like "2024-11-22" from a file.
KIF_Status ReadThree(const char *path, char separator, int32_t (&numbers)[3]) {
  char text[32];
  const KIF_Status status = ReadHostFile(path, text, sizeof(text));
  if (status != KIF_STATUS_OK) return status;
  const char *place = text;
  for (size_t i = 0; i < 3; ++i) {
    uint64_t number;
    if (i > 0 && *place++ != separator) return KIF_STATUS_IO_ERROR;
    if (!TakeNumber(&place, &number) || number > 9999) return KIF_STATUS_IO_ERROR;
    numbers[i] = static_cast<int32_t>(number);
  }
  return KIF_STATUS_OK;
}

KIF_Status ReadAttributes(ClockRecord *clock) {
  int32_t date[3];
  int32_t time[3];
  KIF_Status status = ReadThree("/sys/class/rtc/rtc0/date", '-', date);
  if (status == KIF_STATUS_OK) status = ReadThree("/sys/class/rtc/rtc0/time", ':', time);
  if (status == KIF_STATUS_OK) *clock = {time[0], time[1], time[2], date[2], date[1], date[0], {}};
  return status;
}

bool TakeInputs(const KIF_ParamList *input, rtc_time *time) {
  int64_t values[kInputs];
  if (CountOf(input) != kInputs) return false;
  for (uint32_t i = 0; i < kInputs; ++i) {
    if (!IntegerAt(input, i, &values[i]) || values[i] < 0 || values[i] > 9999) return false;
  }
  time->tm_mon = static_cast<int>(values[kMonth]) - 1;
  time->tm_mday = static_cast<int>(values[kDay]);
  time->tm_year = static_cast<int>(values[kYear]) - 1900;
  time->tm_hour = static_cast<int>(values[kHour]);
  time->tm_min = static_cast<int>(values[kMinute]);
  time->tm_sec = static_cast<int>(values[kSecond]);
  return true;
}

}  // namespace

// The device is open to one reader at a time and mostly to root alone; its attributes are not.
KIF_Status GetClock(const NodeInfo &, const KIF_ParamList *, void *record) {
  ClockRecord clock = {};
  const KIF_Status deviceStatus = ReadDevice(&clock);
  KIF_Status status = deviceStatus;
  if (status != KIF_STATUS_OK) status = ReadAttributes(&clock);
  if (status == KIF_STATUS_NOT_FOUND && deviceStatus != KIF_STATUS_NOT_SUPPORTED) {
    status = deviceStatus;
  }
  if (status == KIF_STATUS_OK) *static_cast<ClockRecord *>(record) = clock;
  return status;
}

// The kernel checks the date against the calendar.
KIF_Status SetClock(const NodeInfo &, const KIF_ParamList *instance, const KIF_ParamList *input) {
  rtc_time time = {};
  if (CountOf(instance) != 0 || !TakeInputs(input, &time)) return KIF_STATUS_BAD_PARAMETER;
  if (IsForeignRoot()) return KIF_STATUS_NOT_SUPPORTED;
  Descriptor device;
  const KIF_Status status = OpenHostFile(kDevice, O_RDONLY, &device);
  if (status != KIF_STATUS_OK) return status;
  if (ioctl(device.fd(), RTC_SET_TIME, &time) == 0) return KIF_STATUS_OK;
  return errno == EINVAL ? KIF_STATUS_BAD_PARAMETER : StatusOfErrno(errno);
}
