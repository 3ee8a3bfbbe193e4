// Any bytes as a cache file that the tools themselves walk, each run in a process of its own under
// limits of memory, time and output that grow with the file: what asks for more is a fault, as is a
// signal. The command lines take turns.
#include <signal.h>
#include <string.h>
#include <sys/resource.h>
#include <sys/time.h>
#include <sys/wait.h>

#include "cache_file.h"
#include "read_host.h"
#include "surroundings.h"
#include "zellibs.h"

int ProgramMain(int argc, char **argv);  // of the program, under another name

namespace {

constexpr rlim_t kMiB = 1 << 20;

const char *const kRuns[] = {
    "ps -cgPTstvZUiz", "ps -Jcz", "lspci -vde", "lspci -p",    "lsof",           "irqinfo",
    "amldump",         "mdf -h",  "pidof sh",   "pgrep -lf .", "bootOption -ro", "userspaceof 1",
    "zelvar -v",       "mdu -u",  "uptime",     "hwclock"};
size_t turn;

void Limit(int resource, rlim_t most) {
  const rlimit limit = {most, most};
  setrlimit(resource, &limit);
}

rlim_t AddressSpace() {
  FILE *file = fopen("/proc/self/statm", "r");
  unsigned long pages = 0;
  if (file == nullptr || fscanf(file, "%lu", &pages) != 1) abort();
  fclose(file);
  return rlim_t{pages} * 4096;
}

[[noreturn]] void Run(const char *run, size_t size) {
  const int out = open((folder + "/out").c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0600);
  if (out < 0 || chdir(folder.c_str()) != 0) _exit(0);
  dup2(out, STDOUT_FILENO);
  dup2(fileno(nowhere), STDERR_FILENO);
  Limit(RLIMIT_CORE, 0);
  Limit(RLIMIT_AS, AddressSpace() + 64 * kMiB + 200 * size);
  Limit(RLIMIT_FSIZE, 64 * kMiB + 200 * size);
  const itimerval timer = {{}, {static_cast<time_t>(2 + size / 10000), 0}};
  setitimer(ITIMER_PROF, &timer, nullptr);
  signal(SIGPIPE, SIG_IGN);
  for (const int number : {SIGPROF, SIGXFSZ, SIGSEGV, SIGBUS, SIGABRT}) signal(number, SIG_DFL);
  std::string words = std::string("zlkkiftools -c host.kif ") + run;
  char *arguments[8] = {strtok(words.data(), " ")};
  int count = 1;
  while ((arguments[count] = strtok(nullptr, " ")) != nullptr) ++count;
  const int status = ProgramMain(count, arguments);
  fflush(stdout);
  _exit(status & 0x3f);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  Write("/host.kif", data, size);
  if (KIF_UseCache((folder + "/host.kif").c_str(), 0) != 0) return 0;
  ReadHost(nullptr);  // shows the fuzzer the way; what a child does it does not see
  const char *run = kRuns[turn++ % std::size(kRuns)];
  const pid_t child = fork();
  if (child == 0) Run(run, size);
  int status = 0;
  if (child < 0 || waitpid(child, &status, 0) != child) return 0;
  if (WIFSIGNALED(status)) {
    dprintf(STDERR_FILENO, "%s: ended by signal %d\n", run, WTERMSIG(status));
    abort();
  }
  std::error_code ignored;
  for (const auto &entry : std::filesystem::directory_iterator(folder)) {
    if (entry.path().filename() != "host.kif") std::filesystem::remove(entry.path(), ignored);
  }
  return 0;
}
