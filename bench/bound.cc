// The least that `uptime` from a recording can cost: a program that makes the same reads and prints
// a line of the same shape; with ONE_CALL it also loads libzellibs.so and calls one function of it.
//   bound FILE
#include <fcntl.h>
#include <stdio.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <time.h>
#include <unistd.h>

#ifdef ONE_CALL
extern "C" bool HostType_OSIsZLK(void);
#endif

int main(int, char **argv) {
  const int file = open(argv[1], O_RDONLY);
  struct stat status;
  if (fstat(file, &status) != 0 || status.st_size == 0) return 1;
  const auto size = static_cast<size_t>(status.st_size);
  void *map = mmap(nullptr, size, PROT_READ, MAP_PRIVATE, file, 0);
  if (map == MAP_FAILED) return 1;
  close(file);
  const auto *bytes = static_cast<const unsigned char *>(map);
  const time_t now = time(nullptr);
  const struct tm *local = localtime(&now);
  printf(" %2d:%02d:%02d up %02u:%02u:%02u, load average: %.2f, %.2f, %.2f\n", local->tm_hour,
         local->tm_min, local->tm_sec, bytes[0], bytes[1], bytes[size - 1], bytes[2] / 100.0,
         bytes[3] / 100.0, bytes[size / 2] / 100.0);
#ifdef ONE_CALL
  return HostType_OSIsZLK() ? 1 : 0;
#endif
}
