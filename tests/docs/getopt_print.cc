// A preloaded library that prints the options a tool takes, a line each, and ends the tool: "-d",
// with ":" where the option takes an argument and "::" where it may take one.
#include <getopt.h>
#include <stdio.h>
#include <string.h>
#include <unistd.h>

namespace {

[[noreturn]] void PrintAndExit(const char *letters, const option *longOptions) {
  for (; *letters != '\0'; ++letters) {
    const size_t colons = strspn(letters + 1, ":");
    dprintf(STDOUT_FILENO, "-%.*s\n", static_cast<int>(1 + colons), letters);
    letters += colons;
  }
  for (; longOptions != nullptr && longOptions->name != nullptr; ++longOptions) {
    const char *colons[] = {"", ":", "::"};
    dprintf(STDOUT_FILENO, "--%s%s\n", longOptions->name, colons[longOptions->has_arg]);
  }
  _exit(0);
}

}  // namespace

extern "C" int getopt(int, char *const *, const char *letters) noexcept {
  PrintAndExit(letters, nullptr);
}

extern "C" int getopt_long(int, char *const *, const char *letters, const option *longOptions,
                           int *) noexcept {
  PrintAndExit(letters, longOptions);
}
