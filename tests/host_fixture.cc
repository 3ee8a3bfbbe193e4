#include "host_fixture.h"

#include <errno.h>
#include <fcntl.h>
#include <stdlib.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <future>
#include <set>
#include <sstream>

namespace {

// All that comes out of a pipe, whose end is closed then.
std::string Drain(int end) {
  std::string text;
  char block[65536];
  for (ssize_t got; (got = read(end, block, sizeof(block))) > 0;) {
    text.append(block, static_cast<size_t>(got));
  }
  close(end);
  return text;
}

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
  // A shell would take the last.
  std::set<std::string> names;
  std::erase_if(environment, [&names](const std::string &variable) {
    return !names.insert(variable.substr(0, variable.find('='))).second;
  });
  return environment;
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
  int out[2], err[2];
  if (pipe2(out, O_CLOEXEC) != 0 || pipe2(err, O_CLOEXEC) != 0) abort();
  const pid_t child = fork();
  if (child == 0) {
    dup2(open("/dev/null", O_RDONLY | O_CLOEXEC), STDIN_FILENO);
    dup2(out[1], STDOUT_FILENO);
    dup2(err[1], STDERR_FILENO);
    signal(SIGPIPE, SIG_DFL);
    if (chdir(directory.c_str()) != 0) _exit(126);
    execvpe(arguments[0], arguments.data(), variables.data());
    _exit(127);
  }
  close(out[1]);
  close(err[1]);
  std::future<std::string> messages = std::async(std::launch::async, Drain, err[0]);
  Outcome outcome = {Drain(out[0]), messages.get()};
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
  Run({"sh", "-c", R"(
    mkdir -p .programs && cp -a "$BIN_DIR" "$LIB_DIR" .programs
    chmod a+rwx . .programs .programs/*
    chmod a+rx .programs/bin/zlkkiftools .programs/lib/libzellibs.so)"});
  return scratch_ + "/.programs/bin";
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
