// ps on this machine, against /proc: every world that lives through the run.
#include <gmock/gmock.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <map>
#include <regex>
#include <sstream>

#include "host_fixture.h"

namespace {

// What /proc says of a thread and does not change while it sleeps.
struct Task {
  int process;
  std::string name;
  bool isKernel;
  bool isZombie;
  int parent;
  int group;
  int session;
  std::string commandLine;

  bool operator==(const Task &) const = default;
};

class PsLive : public HostTest {
 protected:
  static std::map<int, Task> Tasks() {
    std::map<int, Task> tasks;
    std::error_code gone;
    for (const auto &process : std::filesystem::directory_iterator("/proc")) {
      const int id = atoi(process.path().filename().c_str());
      if (id == 0) continue;
      for (const auto &task : std::filesystem::directory_iterator(process.path() / "task", gone)) {
        AddTask(id, task.path(), &tasks);
      }
    }
    return tasks;
  }

  static void AddTask(int process, const std::filesystem::path &path, std::map<int, Task> *tasks) {
    const std::string stat = ReadFile((path / "stat").string());
    const size_t end = stat.rfind(')');
    if (end == std::string::npos) return;
    Task task = {};
    task.process = process;
    task.name = stat.substr(stat.find('(') + 1, end - stat.find('(') - 1);
    char state;
    int terminal, terminalGroup;
    unsigned flags;
    std::istringstream(stat.substr(end + 2)) >> state >> task.parent >> task.group >>
        task.session >> terminal >> terminalGroup >> flags;
    task.isZombie = state == 'Z' || state == 'X';
    task.isKernel = (flags & 0x200000) != 0;
    task.commandLine = ReadFile((path / "cmdline").string());
    (*tasks)[atoi(path.filename().c_str())] = task;
  }

  // The rows by world ID.
  static std::map<int, std::string> Rows(const std::string &out) {
    std::map<int, std::string> rows;
    std::istringstream lines(out);
    std::string line;
    for (std::getline(lines, line); std::getline(lines, line) && !line.empty();) {
      if (line.find("  <zombie>") == std::string::npos) rows[atoi(line.c_str())] = line;
    }
    return rows;
  }
};

std::string Quoted(const std::string &text) {
  return std::regex_replace(text, std::regex(R"([\^$\\.*+?()\[\]{}|])"), R"(\$&)");
}

bool IsPlain(const std::string &text) {
  return text.find_first_not_of(
             "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789"
             "_-./:=,@ ") == std::string::npos;
}

// The command line of a row, as the kernel's bytes: words ended by NULs become words parted by
// blanks, and 1023 bytes are shown at most.
std::string Shown(std::string commandLine) {
  for (char &byte : commandLine) {
    if (byte == '\0') byte = ' ';
  }
  commandLine.erase(commandLine.find_last_not_of(' ') + 1);
  return commandLine.empty() ? "<unavailable>" : commandLine.substr(0, 1023);
}

TEST_F(PsLive, AgreesWithProc) {
  const std::map<int, Task> before = Tasks();
  const Outcome outcome = Linux("/", {"ps", "-cgPTstvZUiz"});
  const std::map<int, Task> after = Tasks();
  ASSERT_EQ(outcome.status, 0) << outcome.err;
  const std::map<int, std::string> rows = Rows(outcome.out);
  int compared = 0;
  for (const auto &[id, task] : before) {
    const auto still = after.find(id);
    if (still == after.end() || !(still->second == task)) continue;
    ASSERT_EQ(rows.count(id), task.isZombie ? 0u : 1u) << id;
    // The kernel names its workers after what they do at the moment.
    if (task.isZombie || !IsPlain(task.name) || task.name.rfind("kworker/", 0) == 0) continue;
    const std::string group = task.isKernel ? "0" : std::to_string(task.group);
    const std::string session = task.isKernel ? "0" : std::to_string(task.session);
    std::string pattern = std::to_string(id) + " +" +
                          (task.isKernel ? "0" : std::to_string(task.process)) + " +" +
                          Quoted(task.name) + " +" + group + " +" + session + " +-?[0-9]+ +" +
                          (task.isKernel        ? "System"
                           : id == task.process ? "User"
                                                : "User,Clone") +
                          " .*";
    EXPECT_TRUE(std::regex_match(rows.at(id), std::regex(pattern))) << rows.at(id) << pattern;
    const std::string commandLine = Shown(task.commandLine);
    if (!task.isKernel && IsPlain(commandLine)) {
      EXPECT_THAT(rows.at(id), testing::EndsWith("  " + commandLine));
    }
    ++compared;
  }
  EXPECT_GT(compared, 10);
}

// A container with a process that has ended and is not waited for.
TEST_F(PsLive, ContainersAreUserspaces) {
  if (geteuid() != 0 || Run({"unshare", "--pid", "--fork", "true"}).status != 0) {
    GTEST_SKIP() << "may not make a PID namespace";
  }
  const pid_t child = fork();
  if (child == 0) {
    setpgid(0, 0);
    execlp("unshare", "unshare", "--pid", "--fork", "--kill-child", "sh", "-c",
           "sleep 0.05 & exec sleep 61", nullptr);
    _exit(127);
  }
  usleep(500000);
  const Outcome outcome = Linux("/", {"ps", "-Jc"});
  kill(-child, SIGKILL);
  waitpid(child, nullptr, 0);
  // The root, on a line after the number of its userspace, and the zombie below it.
  EXPECT_TRUE(std::regex_search(
      outcome.out, std::regex("\n([2-9]|[0-9]{2,})\n\016m\017\016q\017[0-9]+ .*  sleep +sleep 61\n"
                              "  \016m\017\016q\017[0-9]+ .*  <zombie>")))
      << outcome.out;
}

// Trees of files, as another machine or nobody ever had them.
class ProcessTree : public HostTest {
 protected:
  // A process or, with `thread`, another thread of it; `pidNamespace` 0: its link is missing.
  void Add(int process, const std::string &name, char state, int parent, int threads,
           const std::string &commandLine, int pidNamespace = 1, int thread = 0) {
    const std::string id = std::to_string(process);
    const std::string task = std::to_string(thread != 0 ? thread : process);
    WriteFile("tree/proc/" + id + "/task/" + task + "/stat",
              task + " (" + name + ") " + state + " " + std::to_string(parent) + " " + id + " " +
                  id + " 0 -1 " + (name == "kernel" ? "2097152" : "0") + " 0 0 0 0 1 2 0 0 20 0 " +
                  std::to_string(threads) + " 0 100 0 0\n");
    if (thread != 0) return;
    WriteFile("tree/proc/" + id + "/cmdline", commandLine);
    if (pidNamespace == 0) return;
    const std::string link = Scratch() + "/tree/proc/" + id + "/ns";
    std::filesystem::create_directory(link);
    const std::string target = "pid:[" + std::to_string(pidNamespace) + "]";
    ASSERT_EQ(symlink(target.c_str(), (link + "/pid").c_str()), 0);
  }
  std::string Out(const std::vector<std::string> &arguments) {
    return Linux(Scratch() + "/tree", arguments).out;
  }
};

TEST_F(ProcessTree, CartelsAreUserProcessesThatLive) {
  Add(1, "init", 'S', 0, 1, std::string("init\0", 5));
  Add(2, "kernel", 'S', 0, 1, "kernel");
  Add(3, "ended", 'Z', 1, 1, "ended");
  EXPECT_EQ(Out({"pgrep", "-f", "."}), "1 \b\n");
  EXPECT_EQ(Out({"pidof", "kernel", "ended", "init"}), "1 \n");
}

TEST_F(ProcessTree, ThreadsOutliveTheirMainThread) {
  Add(1, "init", 'S', 0, 1, "init");
  Add(5, "leader", 'Z', 1, 2, "", 2);
  Add(5, "worker", 'S', 1, 2, "", 2, 6);
  EXPECT_EQ(Out({"ps", "-U"}),
            "WID  CID  WorldName  UserSpace\n"
            "1  1  init    1        \n"
            "6  5  worker  2        \n\n");
}

TEST_F(ProcessTree, TextsAreCutAndMadePrintable) {
  // A control character written the long way, half of a pair of UTF-16, and what is beyond Unicode.
  Add(1,
      "a\xe0\x80\x9b"
      "b\xed\xa0\x80"
      "c\xf4\x90\x80\x80",
      'S', 0, 1, std::string(1022, 'x') + std::string("\0more\0", 6));
  EXPECT_EQ(Out({"ps", "-c"}),
            "WID  CID  WorldName      Command\n1  1  a\xe0??b\xed\xa0?c\xf4???  " +
                std::string(1022, 'x') + "\n\n");
}

}  // namespace
