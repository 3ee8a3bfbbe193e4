#include "host_fixture.h"

#include <errno.h>
#include <fcntl.h>
#include <poll.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <sstream>

namespace {

// A pipe whose ends close with it.
struct Pipe {
  int ends[2] = {-1, -1};
  Pipe() {
    if (pipe2(ends, O_CLOEXEC) != 0) abort();
  }
  ~Pipe() {
    Close(0);
    Close(1);
  }
  void Close(int end) {
    if (ends[end] >= 0) close(ends[end]);
    ends[end] = -1;
  }
};

std::vector<char *> Pointers(const std::vector<std::string> &texts) {
  std::vector<char *> pointers;
  for (const std::string &text : texts) pointers.push_back(const_cast<char *>(text.c_str()));
  pointers.push_back(nullptr);
  return pointers;
}

std::vector<std::string> Environment(const std::vector<std::string> &added) {
  // The first value of a name counts.
  std::vector<std::string> environment = added;
  environment.insert(environment.end(),
                     {"PATH=/usr/sbin:/usr/bin:/sbin:/bin", "TZ=UTC", "BIN_DIR=" BIN_DIR,
                      "LIB_DIR=" LIB_DIR, "ASAN_OPTIONS=detect_leaks=1"});
  return environment;
}

// Feeds `input` to the child and takes what it writes, until it has closed both streams.
void Exchange(const std::string &input, Pipe *in, Pipe *out, Pipe *err, Outcome *outcome) {
  size_t fed = 0;
  while (out->ends[0] >= 0 || err->ends[0] >= 0) {
    if (fed == input.size()) in->Close(1);
    pollfd waits[3] = {
        {out->ends[0], POLLIN, 0}, {err->ends[0], POLLIN, 0}, {in->ends[1], POLLOUT, 0}};
    if (poll(waits, 3, -1) < 0 && errno != EINTR) abort();
    Pipe *pipes[2] = {out, err};
    std::string *texts[2] = {&outcome->out, &outcome->err};
    for (int i = 0; i < 2; ++i) {
      if (waits[i].fd < 0 || waits[i].revents == 0) continue;
      char block[65536];
      const ssize_t got = read(waits[i].fd, block, sizeof(block));
      if (got > 0) texts[i]->append(block, static_cast<size_t>(got));
      if (got == 0) pipes[i]->Close(0);
    }
    if (waits[2].fd >= 0 && waits[2].revents != 0) {
      const ssize_t put = write(waits[2].fd, input.data() + fed, input.size() - fed);
      fed = put > 0 ? fed + static_cast<size_t>(put) : input.size();
    }
  }
}

}  // namespace

HostTest::HostTest() {
  char pattern[] = "/tmp/zlkkiftools-test-XXXXXX";
  if (mkdtemp(pattern) == nullptr) abort();
  scratch_ = pattern;
  signal(SIGPIPE, SIG_IGN);
}

HostTest::~HostTest() {
  std::error_code ignored;
  std::filesystem::remove_all(scratch_, ignored);
}

std::string HostTest::Record(const std::string &hostText) {
  const std::string number = std::to_string(++recorded_);
  const std::string text = WriteFile("host" + number + ".txt", hostText);
  const std::string file = scratch_ + "/host" + number + ".kif";
  const Outcome outcome = Run({BIN_DIR "/kifcache", "build", text, file});
  EXPECT_EQ(outcome.status, 0) << outcome.err;
  return file;
}

Outcome HostTest::Run(const std::vector<std::string> &commandLine, Surroundings surroundings) {
  const std::string directory = surroundings.directory.empty() ? scratch_ : surroundings.directory;
  std::string preloaded;
  for (const std::string &library : surroundings.preloaded) {
    preloaded += (preloaded.empty() ? "" : ":") + Preload(library);
  }
  if (!preloaded.empty()) {
    surroundings.environment.push_back("LD_PRELOAD=" + preloaded);
    surroundings.environment.push_back("ASAN_OPTIONS=verify_asan_link_order=0:detect_leaks=1");
  }
  const std::vector<std::string> environment = Environment(surroundings.environment);
  std::vector<char *> arguments = Pointers(commandLine);
  std::vector<char *> variables = Pointers(environment);
  Pipe in, out, err;
  const pid_t child = fork();
  if (child == 0) {
    dup2(in.ends[0], STDIN_FILENO);
    dup2(out.ends[1], STDOUT_FILENO);
    dup2(err.ends[1], STDERR_FILENO);
    signal(SIGPIPE, SIG_DFL);
    if (chdir(directory.c_str()) != 0) _exit(126);
    execvpe(arguments[0], arguments.data(), variables.data());
    _exit(127);
  }
  in.Close(0);
  out.Close(1);
  err.Close(1);
  Outcome outcome;
  Exchange(surroundings.input, &in, &out, &err, &outcome);
  int status = 0;
  while (waitpid(child, &status, 0) < 0 && errno == EINTR) {
  }
  outcome.status = WIFSIGNALED(status) ? -WTERMSIG(status) : WEXITSTATUS(status);
  return outcome;
}

std::string HostTest::Link(const std::string &path) {
  const std::filesystem::path target = path;
  const std::filesystem::path link = std::filesystem::path(scratch_) / ".links" / target.filename();
  std::error_code exists;
  std::filesystem::create_directories(link.parent_path());
  std::filesystem::create_symlink(target, link, exists);
  return link.string();
}

std::string HostTest::ProgramsForAnyone() {
  namespace fs = std::filesystem;
  const fs::path programs = fs::path(scratch_) / ".programs";
  const auto how = fs::copy_options::recursive | fs::copy_options::copy_symlinks |
                   fs::copy_options::skip_existing;
  std::error_code exists;
  fs::create_directory(programs);
  fs::copy(BIN_DIR, programs / "bin", how, exists);
  fs::copy(LIB_DIR, programs / "lib", how, exists);
  const auto open = fs::perms::owner_all | fs::perms::group_all | fs::perms::others_all;
  fs::permissions(scratch_, open);
  for (const fs::path &folder : {programs, programs / "bin", programs / "lib"}) {
    fs::permissions(folder, open);
  }
  for (const char *file : {"bin/zlkkiftools", "lib/libzellibs.so"}) {
    fs::permissions(programs / file, fs::perms::others_read | fs::perms::others_exec,
                    fs::perm_options::add);
  }
  return (programs / "bin").string();
}

std::string HostTest::WriteFile(const std::string &path, const std::string &bytes) {
  const std::filesystem::path file = std::filesystem::path(scratch_) / path;
  std::filesystem::create_directories(file.parent_path());
  std::ofstream(file, std::ios::binary) << bytes;
  return file.string();
}

std::string HostTest::ReadFile(const std::string &path) {
  std::ostringstream bytes;
  bytes << std::ifstream(path, std::ios::binary).rdbuf();
  return bytes.str();
}
