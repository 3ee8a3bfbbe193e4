// hwclock: shows or sets the hardware clock, which runs in UTC.
#include <getopt.h>
#include <stdio.h>

#include "base/shown.h"
#include "kif/kif.h"
#include "output.h"
#include "records/platform.h"
#include "tools.h"

namespace {

constexpr int32_t kNotGiven = -1;

struct ClockTime {
  int32_t hour = kNotGiven;
  int32_t minute = kNotGiven;
  int32_t second = kNotGiven;
  int32_t month = kNotGiven;
  int32_t day = kNotGiven;
  int32_t year = kNotGiven;
};

int Usage() {
  fputs(
      "hwclock     -d --date <date>         Set date\n"
      "            -t --time <time>         Set time\n"
      "\n"
      "Valid date format: MM/DD/YYYY\n"
      "Valid time format: HH:MM:SS\n",
      Messages());
  return 1;
}

// False when the usage text is due; `*time` and `*date` stay null when they were not given.
bool ParseOptions(int argc, char **argv, const char **time, const char **date) {
  static const struct option longOptions[] = {
      {"time", required_argument, nullptr, 't'},
      {"date", required_argument, nullptr, 'd'},
      {"help", no_argument, nullptr, 'h'},
      {nullptr, 0, nullptr, 0},
  };
  int option;
  while ((option = getopt_long(argc, argv, "t:d:", longOptions, nullptr)) != -1) {
    switch (option) {
      case 't':
        *time = optarg;
        break;
      case 'd':
        *date = optarg;
        break;
      default:
        return false;
    }
  }
  return true;
}

bool ParseTime(const char *text, ClockTime *wanted) {
  if (text == nullptr) return true;
  if (sscanf(text, "%d:%d:%d", &wanted->hour, &wanted->minute, &wanted->second) == 3) return true;
  printf("Invalid time format: %s\n", Printable(text).text());
  return false;
}

bool ParseDate(const char *text, ClockTime *wanted) {
  if (text == nullptr) return true;
  if (sscanf(text, "%d/%d/%d", &wanted->month, &wanted->day, &wanted->year) == 3) return true;
  printf("Invalid date format: %s\n", Printable(text).text());
  return false;
}

void FillFromClock(ClockTime *wanted, const ClockRecord &clock) {
  if (wanted->hour == kNotGiven) wanted->hour = clock.hour;
  if (wanted->minute == kNotGiven) wanted->minute = clock.minute;
  if (wanted->second == kNotGiven) wanted->second = clock.second;
  if (wanted->month == kNotGiven) wanted->month = clock.month;
  if (wanted->day == kNotGiven) wanted->day = clock.day;
  if (wanted->year == kNotGiven) wanted->year = clock.year;
}

int ClockUnavailable(KIF_Status status) {
  printf("KIF_Get error: 0x%x\n", status);
  return 1;
}

int UpdateFailed(KIF_Status status) {
  printf("KIF_Set error: 0x%x\n", status);
  return 1;
}

int SetClock(const ClockTime &wanted) {
  constexpr uint32_t kInputs = 6;
  const ParamListHandle input(KIF_ParamListCreate(KIF_PARAMLIST_INPUT, kInputs));
  if (input == nullptr) return UpdateFailed(KIF_STATUS_NO_MEMORY);
  const int32_t values[kInputs] = {wanted.month, wanted.day,    wanted.year,
                                   wanted.hour,  wanted.minute, wanted.second};
  for (const int32_t value : values) {
    const KIF_Status status = KIF_ParamListAddInt(input.get(), static_cast<uint32_t>(value));
    if (status != 0) return UpdateFailed(status);
  }
  uint32_t answer = 0;
  const KIF_Status status =
      KIF_Set(KIF_NODE_hardware_chipset_rtc, nullptr, input.get(), &answer, 0);
  if (status != 0) return UpdateFailed(status);
  printf("Clock updated.\nTime: %.2d:%.2d:%.2d   Date: %.2d/%.2d/%.2d   UTC\n", wanted.hour,
         wanted.minute, wanted.second, wanted.month, wanted.day, wanted.year);
  return 0;
}

}  // namespace

int HwclockEntry(int argc, char **argv) {
  const char *time = nullptr;
  const char *date = nullptr;
  if (!ParseOptions(argc, argv, &time, &date)) return Usage();

  ClockTime wanted;
  if (!ParseTime(time, &wanted) || !ParseDate(date, &wanted)) return 1;
  if (time == nullptr || date == nullptr) {
    ClockRecord clock = {};
    const KIF_Status status = ReadRecord(KIF_NODE_hardware_chipset_rtc, nullptr, &clock);
    if (status != 0) return ClockUnavailable(status);
    FillFromClock(&wanted, clock);
  }
  if (time != nullptr || date != nullptr) return SetClock(wanted);

  printf("%.2d:%.2d:%.2d   %.2d/%.2d/%.4d   UTC\n", wanted.hour, wanted.minute, wanted.second,
         wanted.month, wanted.day, wanted.year);
  return 0;
}
