// lsof on this machine and on trees of files: agreement with /proc and with the machine's own lsof.
#include <arpa/inet.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <linux/netlink.h>
#include <netinet/in.h>
#include <sched.h>
#include <signal.h>
#include <sys/epoll.h>
#include <sys/eventfd.h>
#include <sys/mman.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cstddef>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <map>
#include <sstream>
#include <string>
#include <vector>

#include "host_fixture.h"

namespace {

struct Row {
  std::string kind;
  std::string description;
};

std::string Trimmed(const std::string &text) {
  return text.substr(0, text.find_last_not_of(' ') + 1);
}

// A process that does nothing but hold what the test has opened.
class Holder {
 public:
  // `prepare` runs in the child; what it gives is exit status of a child that cannot do it.
  template <typename Prepare>
  explicit Holder(Prepare prepare) {
    int ready[2];
    if (pipe2(ready, O_CLOEXEC) != 0) abort();
    pid_ = fork();
    if (pid_ == 0) {
      prepared_ = prepare();
      if (write(ready[1], &prepared_, sizeof(prepared_)) != sizeof(prepared_)) _exit(1);
      close(ready[0]);
      close(ready[1]);
      while (true) pause();
    }
    close(ready[1]);
    if (read(ready[0], &prepared_, sizeof(prepared_)) != sizeof(prepared_)) prepared_ = 0;
    close(ready[0]);
  }
  Holder() : Holder([] { return 1; }) {}
  ~Holder() {
    kill(pid_, SIGKILL);
    waitpid(pid_, nullptr, 0);
  }
  pid_t pid() const { return pid_; }
  int prepared() const { return prepared_; }  // what `prepare` gave
  std::string proc() const { return "/proc/" + std::to_string(pid_); }

 private:
  pid_t pid_ = -1;
  int prepared_ = 0;
};

template <typename Address>
int Bound(int type, const Address &address, socklen_t length = sizeof(Address)) {
  const int fd = socket(reinterpret_cast<const sockaddr *>(&address)->sa_family, type, 0);
  return bind(fd, reinterpret_cast<const sockaddr *>(&address), length) == 0 ? fd : -1;
}

sockaddr_in Loopback() {
  sockaddr_in address = {};
  address.sin_family = AF_INET;
  address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
  return address;
}

int PortOf(int fd) {
  sockaddr_in6 address = {};  // the port stands at the same place in both
  socklen_t length = sizeof(address);
  getsockname(fd, reinterpret_cast<sockaddr *>(&address), &length);
  return ntohs(address.sin6_port);
}

int ConnectedTo(int port, int type) {
  sockaddr_in address = Loopback();
  address.sin_port = htons(static_cast<uint16_t>(port));
  const int fd = socket(AF_INET, type, 0);
  const auto *generic = reinterpret_cast<const sockaddr *>(&address);
  return connect(fd, generic, sizeof(address)) == 0 ? fd : -1;
}

int UnixListener(const std::string &name) {
  sockaddr_un address = {};
  address.sun_family = AF_UNIX;
  memcpy(address.sun_path, name.data(), name.size());
  const int fd = Bound(SOCK_STREAM, address,
                       static_cast<socklen_t>(offsetof(sockaddr_un, sun_path) + name.size()));
  return listen(fd, 1) == 0 ? fd : -1;
}

class LsofLive : public HostTest {
 protected:
  ~LsofLive() override {
    for (const auto &[fd, row] : expected_) close(fd);
  }

  // The rows of a cartel by descriptor, and its mappings' descriptions.
  void ParseRows(const std::string &out, pid_t cartel) {
    std::istringstream lines(out);
    const std::string beginning = std::to_string(cartel) + " ";
    for (std::string line; std::getline(lines, line);) {
      if (line.compare(0, beginning.size(), beginning) != 0) continue;
      const std::string kind = Trimmed(line.substr(34, 20));
      const int fd = std::stoi(line.substr(57, 6));
      if (kind == "MMAP") {
        EXPECT_EQ(fd, -1);
        mappings_.push_back(line.substr(66));
      } else {
        rows_[fd] = {kind, line.substr(66)};
      }
    }
  }

  void List(const std::string &root, pid_t cartel) {
    const Outcome outcome = Linux(root, {"lsof"});
    EXPECT_EQ(outcome.status, 0);
    EXPECT_EQ(outcome.err, "");
    ParseRows(outcome.out, cartel);
  }

  void Expect(int fd, const std::string &kind, const std::string &description) {
    ASSERT_GE(fd, 0) << description;
    expected_[fd] = {kind, description};
  }

  // Descriptions with '#' for the inode number of the descriptor.
  void ExpectInode(int fd, const std::string &kind, std::string description) {
    struct stat status;
    ASSERT_EQ(fstat(fd, &status), 0) << description;
    const size_t mark = description.find('#');
    Expect(fd, kind, description.replace(mark, 1, std::to_string(status.st_ino)));
  }

  void CheckExpected() {
    for (const auto &[fd, row] : expected_) {
      EXPECT_EQ(rows_[fd].kind, row.kind) << row.description;
      EXPECT_EQ(rows_[fd].description, row.description);
    }
  }

  void OpenFiles();
  void OpenSockets();

  std::map<int, Row> rows_;
  std::vector<std::string> mappings_;
  std::map<int, Row> expected_;
};

void LsofLive::OpenFiles() {
  const std::string file = WriteFile("a file", "x");
  Expect(open(file.c_str(), O_RDONLY), "FILE", file);
  const std::string deleted = WriteFile("deleted", "x");
  Expect(open(deleted.c_str(), O_RDWR), "FILE", deleted + " (deleted)");
  unlink(deleted.c_str());
  const std::string hostile = WriteFile("\x1b[31m\nna\xc3\xafve", "x");
  Expect(open(hostile.c_str(), O_RDONLY), "FILE", Scratch() + "/?[31m?na\xc3\xafve");
  Expect(open(Scratch().c_str(), O_RDONLY | O_DIRECTORY), "DIR", Scratch());
  const std::string fifo = Scratch() + "/fifo";
  ASSERT_EQ(mkfifo(fifo.c_str(), 0600), 0);
  Expect(open(fifo.c_str(), O_RDWR), "PIPE", fifo);
  Expect(open("/dev/null", O_WRONLY), "CHAR", "/dev/null");
  int ends[2];
  ASSERT_EQ(pipe(ends), 0);
  ExpectInode(ends[0], "PIPE", "pipe:[#]");
  ExpectInode(ends[1], "PIPE", "pipe:[#]");
  Expect(eventfd(0, 0), "ANON", "anon_inode:[eventfd]");
  Expect(epoll_create1(0), "ANON", "anon_inode:[eventpoll]");
  ExpectInode(open("/proc/self/ns/net", O_RDONLY), "ANON", "net:[#]");
  Expect(memfd_create("kept", 0), "FILE", "/memfd:kept (deleted)");
}

void LsofLive::OpenSockets() {
  const int listener = Bound(SOCK_STREAM, Loopback());
  ASSERT_EQ(listen(listener, 1), 0);
  const int port = PortOf(listener);
  const std::string at = "127.0.0.1:" + std::to_string(port);
  Expect(listener, "SOCKET", "TCP " + at + " (LISTEN)");
  const int client = ConnectedTo(port, SOCK_STREAM);
  const std::string from = "127.0.0.1:" + std::to_string(PortOf(client));
  Expect(client, "SOCKET", "TCP " + from + "->" + at + " (ESTABLISHED)");
  Expect(accept(listener, nullptr, nullptr), "SOCKET",
         "TCP " + at + "->" + from + " (ESTABLISHED)");
  sockaddr_in anywhere = Loopback();
  anywhere.sin_addr.s_addr = INADDR_ANY;
  const int receiver = Bound(SOCK_DGRAM, anywhere);
  Expect(receiver, "SOCKET", "UDP *:" + std::to_string(PortOf(receiver)));
  const int sender = ConnectedTo(9, SOCK_DGRAM);
  Expect(sender, "SOCKET", "UDP 127.0.0.1:" + std::to_string(PortOf(sender)) + "->127.0.0.1:9");

  const std::string path = Scratch() + "/a socket";
  Expect(UnixListener(path), "SOCKET", "unix " + path + " type=STREAM (LISTEN)");
  const std::string abstract = "zlkkiftools-" + std::to_string(getpid());
  Expect(UnixListener('\0' + abstract), "SOCKET", "unix @" + abstract + " type=STREAM (LISTEN)");
  int pair[2];
  ASSERT_EQ(socketpair(AF_UNIX, SOCK_SEQPACKET, 0, pair), 0);
  ExpectInode(pair[0], "SOCKET", "unix socket:[#] type=SEQPACKET (CONNECTED)");
  ExpectInode(pair[1], "SOCKET", "unix socket:[#] type=SEQPACKET (CONNECTED)");
  sockaddr_nl netlink = {};
  netlink.nl_family = AF_NETLINK;
  Expect(Bound(SOCK_RAW, netlink), "SOCKET", "netlink ROUTE");
  ExpectInode(socket(AF_INET, SOCK_STREAM, 0), "SOCKET", "socket:[#]");  // in no table
}

TEST_F(LsofLive, NamesWhatAProcessHasOpen) {
  OpenFiles();
  OpenSockets();
  if (HasFatalFailure()) return;
  const Holder holder;
  List("/", holder.pid());
  CheckExpected();
  // And the row of every descriptor is there, in what it is linked to.
  std::map<int, Row> linked;
  for (const auto &entry : std::filesystem::directory_iterator(holder.proc() + "/fd")) {
    const int fd = std::stoi(entry.path().filename());
    EXPECT_EQ(rows_.count(fd), 1u) << fd;
    linked[fd] = {};
    const std::string target = std::filesystem::read_symlink(entry.path());
    if (expected_.count(fd) == 0 && rows_[fd].kind != "SOCKET") {
      EXPECT_EQ(rows_[fd].description, target);
    }
  }
  EXPECT_EQ(rows_.size(), linked.size());
}

TEST_F(LsofLive, NamesInternetSocketsAsTheMachinesLsof) {
  if (!IsInstalled("lsof")) GTEST_SKIP();
  OpenSockets();
  sockaddr_in6 anywhere = {};
  anywhere.sin6_family = AF_INET6;
  const int listener = Bound(SOCK_STREAM, anywhere);
  if (listener >= 0 && listen(listener, 1) == 0) {
    Expect(listener, "SOCKET", "TCP *:" + std::to_string(PortOf(listener)) + " (LISTEN)");
    const int mapped = ConnectedTo(PortOf(listener), SOCK_STREAM);
    close(accept(listener, nullptr, nullptr));
    Expect(mapped, "SOCKET", "");
    anywhere.sin6_addr = in6addr_loopback;
    Expect(Bound(SOCK_DGRAM, anywhere), "SOCKET", "");
  }
  const Holder holder;
  List("/", holder.pid());
  const Outcome theirs =
      Run({"lsof", "-nP", "-w", "-a", "-p", std::to_string(holder.pid()), "-i", "-FfPnT"});
  std::istringstream fields(theirs.out);
  std::map<int, std::string> named;
  int fd = -1;
  for (std::string field; std::getline(fields, field);) {
    if (field[0] == 'f') fd = std::stoi(field.substr(1));
    if (field[0] == 'P') named[fd] = field.substr(1);
    if (field[0] == 'n') named[fd] += " " + field.substr(1);
    if (field.compare(0, 4, "TST=") == 0) named[fd] += " (" + field.substr(4) + ")";
  }
  EXPECT_GE(named.size(), 5u) << theirs.out;
  for (const auto &[number, name] : named) EXPECT_EQ(rows_[number].description, name);
}

TEST_F(LsofLive, ListsMappedFiles) {
  const std::string file = WriteFile("mapped", "x");
  const int fd = open(file.c_str(), O_RDWR);
  constexpr bool kHas64Bits = sizeof(size_t) == 8;
  constexpr auto kLarge = static_cast<size_t>(uint64_t{kHas64Bits ? 5 : 1} << 30);
  ASSERT_EQ(ftruncate(fd, kLarge), 0);
  const auto map = [fd](size_t length, int protection) {
    return mmap(nullptr, length, protection, MAP_SHARED | MAP_NORESERVE, fd, 0);
  };
  ASSERT_NE(map(kLarge, PROT_READ), MAP_FAILED);
  ASSERT_NE(map(8192, PROT_READ | PROT_WRITE), MAP_FAILED);
  ASSERT_NE(map(4096, PROT_NONE), MAP_FAILED);
  close(fd);
  const Holder holder;
  List("/", holder.pid());
  for (const char *shown : {kHas64Bits ? " (prot:R-/len:4294967295)" : " (prot:R-/len:1073741824)",
                            " (prot:RW/len:8192)", " (prot:--/len:4096)"}) {
    EXPECT_EQ(std::count(mappings_.begin(), mappings_.end(), file + shown), 1) << shown;
  }
  std::ifstream maps(holder.proc() + "/maps");
  size_t files = 0;
  for (std::string line; std::getline(maps, line);) {
    if (line.find(" /") == std::string::npos) continue;
    ASSERT_LT(files, mappings_.size());
    const std::string path = line.substr(line.find(" /") + 1);
    EXPECT_EQ(mappings_[files].compare(0, path.size(), path), 0) << mappings_[files];
    ++files;
  }
  EXPECT_EQ(files, mappings_.size());
}

// Gives the port of a listener in a network namespace of its own; 0 where there can be none.
int ListenElsewhere() {
  if (unshare(CLONE_NEWNET) != 0 && unshare(CLONE_NEWUSER | CLONE_NEWNET) != 0) return 0;
  sockaddr_in anywhere = Loopback();
  anywhere.sin_addr.s_addr = INADDR_ANY;
  const int listener = Bound(SOCK_STREAM, anywhere);
  return listen(listener, 1) == 0 ? PortOf(listener) : 0;
}

TEST_F(LsofLive, KnowsTheSocketsOfOtherNetworkNamespaces) {
  OpenSockets();
  const Holder here;
  const Holder elsewhere(ListenElsewhere);
  if (elsewhere.prepared() == 0) GTEST_SKIP() << "no new network namespace";
  List("/", elsewhere.pid());
  CheckExpected();  // inherited, of a namespace read before
  const std::string wanted = "TCP *:" + std::to_string(elsewhere.prepared()) + " (LISTEN)";
  const bool found = std::any_of(rows_.begin(), rows_.end(), [&wanted](const auto &row) {
    return row.second.description == wanted;
  });
  EXPECT_TRUE(found) << wanted;
}

TEST_F(LsofLive, LeavesOutWhatMayNotBeRead) {
  if (geteuid() != 0 || !IsInstalled("setpriv")) GTEST_SKIP() << "needs rights to give up";
  const Holder holder;
  const std::string program = BIN_DIR "/zlkkiftools";
  const Outcome outcome =
      Run({"setpriv", "--reuid=65534", "--regid=65534", "--clear-groups", program, "lsof"});
  if (outcome.status == 126 || outcome.status == 127) GTEST_SKIP() << outcome.err;
  EXPECT_EQ(outcome.status, 0);
  EXPECT_EQ(outcome.err, "");
  ParseRows(outcome.out, holder.pid());
  EXPECT_TRUE(rows_.empty());
  EXPECT_TRUE(mappings_.empty());
}

// A tree of files with one process, 10, whose descriptors and tables the tests write.
class LsofTree : public LsofLive {
 protected:
  LsofTree() {
    WriteProcess("10");
    std::filesystem::create_directories(Scratch() + "/tree/proc/10/fd");
    Write("10/maps", "");
  }

  void WriteProcess(const std::string &id) {
    Write(id + "/stat", id + " (daemon) S 1 " + id + " " + id +
                            " 0 -1 4194560 0 0 0 0 1 2 0 0 20 0 1 0 100 0 0\n");
    Write(id + "/cmdline", std::string("daemon\0", 7));
  }

  void Write(const std::string &path, const std::string &bytes) {
    WriteFile("tree/proc/" + path, bytes);
  }

  void Link(const std::string &name, const std::string &target) {
    const std::string path = Scratch() + "/tree/proc/10/fd/" + name;
    ASSERT_EQ(symlink(target.c_str(), path.c_str()), 0) << target;
  }

  void ListTree() { List(Scratch() + "/tree", 10); }
};

TEST_F(LsofTree, TellsKindsByNamesAlone) {
  Link("0", "/dev/null");
  Link("1", "/dev/pts/3");
  Link("2", Scratch());  // a directory here, which says nothing about the other machine
  Link("9", "pipe:[5]");
  Link("10", "anon_inode:inotify");
  Link("x", "/not/a/descriptor");
  WriteProcess("11");  // vanished while the tree was taken
  const Outcome outcome = Linux(Scratch() + "/tree", {"lsof"});
  const auto row = [](const char *kind, const char *rest) {
    char line[128];
    snprintf(line, sizeof(line), "10          daemon                %-20s   %s\n", kind, rest);
    return std::string(line);
  };
  EXPECT_EQ(outcome.out.substr(outcome.out.find("\n10  ") + 1),
            row("CHAR", "     0   /dev/null") + row("CHAR", "     1   /dev/pts/3") +
                row("FILE", ("     2   " + Scratch()).c_str()) + row("PIPE", "     9   pipe:[5]") +
                row("ANON", "    10   anon_inode:inotify"));
}

constexpr char kInternetHeader[] =
    "  sl  local_address rem_address   st tx_queue rx_queue tr tm->when retrnsmt   uid  timeout "
    "inode\n";

std::string InternetLine(const std::string &addresses, const std::string &state, int inode) {
  return "   0: " + addresses + " " + state + " 00000000:00000000 00:00000000 00000000     0" +
         "        0 " + std::to_string(inode) + " 1 0000000000000000 100 0 0 10 0\n";
}

TEST_F(LsofTree, ReadsTheTablesOfSockets) {
  const struct {
    const char *table;
    std::string line;
    const char *shown;  // null: the link's text
  } kSockets[] = {
      {"tcp", InternetLine("0100007F:0016 0200000A:15B3", "08", 100),
       "TCP 127.0.0.1:22->10.0.0.2:5555 (CLOSE_WAIT)"},
      {"tcp", InternetLine("00000000:0050 00000000:0000", "0A", 101), "TCP *:80 (LISTEN)"},
      {"tcp", InternetLine("00000000:0050 00000000:0000", "FF", 102), "TCP *:80"},
      {"tcp", InternetLine("0100007F0:0016 00000000:0000", "0A", 103), nullptr},
      {"tcp", InternetLine("0100007F 00000000:0000", "0A", 104), nullptr},
      {"tcp6",
       InternetLine("B80D0120000000000000000001000000:01BB 0000000000000000FFFF00000200000A:0001",
                    "01", 105),
       "TCP [2001:db8::1]:443->10.0.0.2:1 (ESTABLISHED)"},
      {"udp6",
       InternetLine("00000000000000000000000000000000:0044 00000000000000000000000000000000:0000",
                    "07", 106),
       "UDP *:68"},
      {"udplite", InternetLine("0100007F:0007 00000000:0000", "07", 107), "UDPLITE 127.0.0.1:7"},
      {"raw", InternetLine("00000000:0001 0200000A:0000", "01", 108), "RAW *:1->10.0.0.2:*"},
      {"icmp", InternetLine("00000000:0003 00000000:0000", "07", 109), "ICMP *:3"},
      {"unix", "0: 00000002 00000000 00010000 0001 01 110 /run/x\x1b y\n",
       "unix /run/x? y type=STREAM (LISTEN)"},
      {"unix", "0: 00000002 00000000 00000000 0002 01 111\n",
       "unix socket:[111] type=DGRAM (UNCONNECTED)"},
      {"unix", "0: 00000002 00000000 00000000 0063 63 112 x\n", "unix x type=? (?)"},
      {"netlink", "0 15  7 00000000 0 0 0 2 0 113\n", "netlink KOBJECT_UEVENT"},
      {"netlink", "0 99  7 00000000 0 0 0 2 0 114\n", "netlink 99"},
      {"packet", "0 3 2 88cc 2 1 0 0 115\n", "packet protocol=0x88cc type=DGRAM"},
      {"packet", "0 3 2 88cc 2 1 0\n\n116\n", nullptr},
      {"raw6", "0: 117", nullptr},
  };
  std::map<std::string, std::string> tables = {{"tcp", kInternetHeader}};
  for (const auto &socket : kSockets) tables[socket.table] += socket.line;
  for (const auto &[name, text] : tables) Write("10/net/" + name, text);
  for (int i = 0; i < static_cast<int>(std::size(kSockets)); ++i) {
    const std::string target = "socket:[" + std::to_string(100 + i) + "]";
    Link(std::to_string(i), target);
    Expect(i, "SOCKET", kSockets[i].shown != nullptr ? kSockets[i].shown : target);
  }
  ListTree();
  CheckExpected();
  expected_.clear();  // no descriptors of this process
}

TEST_F(LsofTree, ReadsAnyTextOfMappings) {
  const std::string longName = "/" + std::string(3000, 'a');
  Write("10/maps",
        "00400000-00401000 r-xp 00000000 08:01 12   /bin/a b (deleted)\n"
        "00401000-00400000 rw-p 00000000 08:01 12   /reversed\n"
        "nonsense\n"
        "\n"
        "00500000-00600000 rw-p 00000000 00:00 0    [heap]\n"
        "00600000-00601000 rw-p 00000000 00:00 0 \n"
        "00600000-00601000\n"
        "7f0000000000-7f0200000000 -w-s 00000000 00:01 5 /dev/zero\x1b (deleted)\n"
        "10000000000000000-10000000000001000 r--p 00000000 00:01 5 /beyond\n"
        "7f0300000000-7f0300001000 r--p 00000000 00:01 5 " +
            longName +
            "\n7f0400000000-7f0400001000 rw-s 00000000 00:0e 9 anon_inode:[perf_event]\n" +
            "ffffffffff600000-ffffffffff601000 --xp 00000000 00:00 8 /last");
  ListTree();
  EXPECT_EQ(mappings_, (std::vector<std::string>{"/bin/a b (deleted) (prot:R-/len:4096)",
                                                 "/dev/zero? (deleted) (prot:-W/len:4294967295)",
                                                 longName.substr(0, 2007) + " (prot:R-/len:4096)",
                                                 "anon_inode:[perf_event] (prot:RW/len:4096)",
                                                 "/last (prot:--/len:4096)"}));
}

}  // namespace
