#include "transcript.h"

#include <gmock/gmock.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <list>
#include <regex>
#include <set>
#include <sstream>

#include "base/utf8.h"
#include "fault/fault.h"
#include "host_fixture.h"

namespace {

using Lines = std::vector<std::string>;

// A part of a file: lines that are kept as they are, or a command and what it is to give.
struct Part {
  int line;
  Lines text;  // of a command: it and its continuations
  Lines expected = {};
  bool isCommand = false;
};

struct Transcript {
  std::string path;
  std::vector<Part> parts;
};

struct Case {
  Transcript *transcript;
  std::string name;
  Lines host;
  std::vector<size_t> commands;  // indices of parts
};

Lines Split(const std::string &text) {
  Lines lines;
  std::istringstream stream(text);
  for (std::string line; std::getline(stream, line);) lines.push_back(line);
  return lines;
}

std::string Join(const Lines &lines) {
  std::string text;
  for (const std::string &line : lines) text += line + "\n";
  return text;
}

// The bytes as a transcript has them; see README.md.
Lines Readable(const std::string &bytes, const std::string &prefix) {
  Lines lines = Split(bytes);
  for (std::string &line : lines) {
    std::string readable = prefix;
    if (prefix.empty() && line.find_first_of("$!#[>=") == 0) readable = "\\";
    for (size_t i = 0; i < line.size();) {
      const auto *at = reinterpret_cast<const unsigned char *>(line.data()) + i;
      size_t length = SequenceLength(at, line.size() - i);
      if (*at == 0xc2 && length > 0 && at[1] < 0xa0) length = 0;  // a control character too
      char escape[8] = {line[i]};
      if (*at == '\t') snprintf(escape, sizeof(escape), "\\t");
      if (*at == '\\') snprintf(escape, sizeof(escape), "\\\\");
      if ((*at < ' ' && *at != '\t') || *at == 0x7f || (*at >= 0x80 && length == 0)) {
        snprintf(escape, sizeof(escape), "\\x%02x", *at);
      }
      readable += length > 0 ? line.substr(i, length) : escape;
      i += std::max<size_t>(length, 1);
    }
    const bool ends = &line != &lines.back() || bytes.back() == '\n';
    if (!ends) readable += "\\c";
    if (ends && (line.empty() || line.back() == ' ')) readable += "\\";
    line = readable;
  }
  return lines;
}

Lines Readable(const Outcome &outcome) {
  Lines lines = Readable(outcome.out, "");
  const Lines messages = Readable(outcome.err, "! ");
  lines.insert(lines.end(), messages.begin(), messages.end());
  if (outcome.status != 0) lines.push_back("[" + std::to_string(outcome.status) + "]");
  return lines;
}

// A line of a file's content, with its end.
std::string Content(const std::string &text) {
  std::string bytes;
  for (size_t i = 0; i < text.size(); ++i) {
    if (text[i] != '\\' || i + 1 == text.size()) {
      if (text[i] != '\\') bytes += text[i];
      continue;
    }
    const char kind = text[++i];
    if (kind == 'c') return bytes;
    if (kind == 'x') {
      bytes += static_cast<char>(std::stoi(text.substr(i + 1, 2), nullptr, 16));
      i += 2;
    } else {
      bytes += kind == 't' ? '\t' : kind == 'n' ? '\n' : kind == '0' ? '\0' : kind;
    }
  }
  return bytes + '\n';
}

// "8680 @0x3c 0b": bytes, and zeros as far as an offset.
std::string Hexadecimal(const std::string &text) {
  std::string bytes;
  std::istringstream stream(text);
  for (std::string word; stream >> word;) {
    if (word[0] == '@') {
      bytes.resize(std::stoul(word.substr(1), nullptr, 0));
      continue;
    }
    for (size_t i = 0; i + 1 < word.size(); i += 2) {
      bytes += static_cast<char>(std::stoi(word.substr(i, 2), nullptr, 16));
    }
  }
  return bytes;
}

// The tools that a link in the folder of the programs runs.
bool IsTool(const std::string &word) {
  return word.find_first_of("/.") == word.npos && word != "kifcache" && word != "zlkkiftools" &&
         access((BIN_DIR "/" + word).c_str(), X_OK) == 0;
}

// Whether a command makes namespaces.
bool IsApart(const Lines &command) {
  return command[0].starts_with("$ apart ") || Join(command).find("unshare ") != std::string::npos;
}

// Whatever a command does that is run so, it reaches no process but its own.
Lines Apart(const Lines &command) {
  Lines apart = {"unshare", "--pid", "--fork", "--mount-proc", "--kill-child"};
  if (geteuid() != 0) apart.insert(apart.end(), {"--user", "--map-root-user"});
  apart.insert(apart.end(), command.begin(), command.end());
  return apart;
}

bool MayRunApart() {
  static const bool may =
      system(
          "unshare $([ $(id -u) = 0 ] || echo -r) --pid --fork --mount-proc --net --mount"
          " mount -t tmpfs none /mnt 2>/dev/null") == 0;
  return may;
}

bool IsApart(const Case &one) {
  return std::any_of(one.commands.begin(), one.commands.end(),
                     [&one](size_t index) { return IsApart(one.transcript->parts[index].text); });
}

class CaseTest : public HostTest {
 public:
  explicit CaseTest(const Case &one) : case_(one) {}

  void TestBody() override {
    if (IsApart(case_) && !MayRunApart()) {
      GTEST_SKIP() << "needs the right to make namespaces and to mount";
    }
    WriteHost();
    for (const size_t index : case_.commands) Check(&case_.transcript->parts[index]);
    if (getenv("RENEW") != nullptr) Save();
  }

 private:
  void WriteHost();
  void WriteTree(const Lines &lines);
  void Check(Part *command);
  void Compare(Part *command, const Lines &lines, const char *way);
  Lines RunCommand(const std::string &words, const std::string &program,
                   const std::string &arguments, const std::string &host, bool apart);
  void Save() const;

  const Case &case_;
  std::string host_ = "none";
};

void CaseTest::WriteHost() {
  Lines text, tree;
  for (const std::string &line : case_.host) {
    // A later answer for the same place takes the place of the one before.
    const std::string key = line.substr(0, line.find(" =")) + " =";
    const bool isTree = line[0] == '/' || line[0] == ' ';
    const auto before = std::find_if(text.begin(), text.end(), [&key](const std::string &other) {
      return (other + " =").starts_with(key);
    });
    if (!isTree && before != text.end()) {
      *before = line;
    } else {
      (isTree ? tree : text).push_back(line);
    }
  }
  if (!tree.empty()) WriteTree(tree);
  if (text.empty()) return;
  std::filesystem::rename(Record(Join(text)), Scratch() + "/host.kif");
  host_ = Scratch() + "/host.kif";
}

void CaseTest::WriteTree(const Lines &lines) {
  host_ = "linux:" + Scratch() + "/tree";
  std::string file;
  for (const std::string &line : lines) {
    if (line[0] == ' ') {
      std::ofstream(file, std::ios::binary | std::ios::app) << Content(line.substr(2));
      continue;
    }
    const size_t arrow = line.find(" -> "), sign = line.find(" =");
    const std::string path = "tree" + line.substr(0, std::min(arrow, sign));
    const std::string value = sign + 3 < line.size() ? line.substr(sign + 3) : "";
    if (path.back() == '/') {
      std::filesystem::create_directories(Scratch() + "/" + path);
    } else if (arrow != line.npos) {
      const std::filesystem::path link = Scratch() + "/" + path;
      std::filesystem::create_directories(link.parent_path());
      std::filesystem::create_symlink(line.substr(arrow + 4), link);
    } else if (value.starts_with("hex ")) {
      file = WriteFile(path, Hexadecimal(value.substr(4)));
    } else {
      file = WriteFile(path, value.empty() ? "" : Content(value));
    }
  }
}

Lines CaseTest::RunCommand(const std::string &words, const std::string &program,
                           const std::string &arguments, const std::string &host, bool apart) {
  // FAIL=operation:n[:status] becomes the words that the preloaded library knows.
  std::string line = words;
  std::string preloaded;
  std::smatch fail;
  if (std::regex_search(line, fail, std::regex("FAIL=(\\w+):(\\d+)(\\+?)(:(\\w+))? "))) {
    std::string variables = fail[3].length() > 0 ? "FAIL_FROM=1 " : "";
    const std::string status = fail[5].length() > 0 ? fail[5].str() : "0xbad0001";
    for (const std::string &word : Failing(fail[1], std::stoi(fail[2]), status).environment) {
      variables += word + " ";
    }
    line = fail.prefix().str() + variables + fail.suffix().str();
    preloaded = Preload(FAULT_INJECT);
  }
  // Whatever the program does, its signals reach no process but those of the command.
  const bool signals = (words + program + arguments).find("pkill") != line.npos;
  if (!preloaded.empty() && signals) preloaded += ":" + Preload(OWN_SIGNALS);
  if (line.find("HWDATA_FOLDER=") != line.npos) preloaded += ":" + Preload(HWDATA_FOLDER);
  if (!preloaded.empty()) {
    line += "LD_PRELOAD=" + preloaded + " ASAN_OPTIONS=verify_asan_link_order=0:detect_leaks=1 ";
  }
  // Another user may not read what is below the scratch folder or the checkout.
  const bool forAnyone = arguments.find("setpriv") != line.npos ||
                         ReadFile(Scratch() + "/script").find("setpriv") != line.npos;
  const std::string programs = forAnyone ? ProgramsForAnyone() : Link(BIN_DIR);
  line = "PATH=" + programs + ":$PATH\n" + line + program + arguments;
  std::vector<std::string> run = {signals ? "bash" : "sh", "-c", line};
  if (apart) run = Apart({"bash", "-c", line});
  if (IsTool(program.substr(program.rfind(' ') + 1))) unlink((Scratch() + "/trace").c_str());
  Surroundings surroundings = {
      .environment = {"ZELLIBS_HOST=" + host, "ZELLIBS_TRACE=" + Scratch() + "/trace",
                      "SOURCE=" + Link(SOURCE_DIR), "LSTAT_DEVICE=" + Preload(LSTAT_DEVICE),
                      "OWN_SIGNALS=" + Preload(OWN_SIGNALS),
                      "ASAN_OPTIONS=detect_leaks=1:verify_asan_link_order=0"}};
  if (signals) surroundings.preloaded = {OWN_SIGNALS};
  const Outcome outcome = Run(run, surroundings);
  Lines lines = Readable(outcome);
  if (ReadFile(Scratch() + "/trace").find("never destroyed") != std::string::npos) {
    lines.push_back("[an object was never destroyed]");
  }
  return lines;
}

void CaseTest::Check(Part *command) {
  std::string line = command->text[0].substr(2);
  for (size_t i = 1; i < command->text.size(); ++i) line += "\n" + command->text[i].substr(2);
  static const std::regex kWords("(live |cached |apart )?((?:\\w+=\\S* )*)([^\\s;|&<>]+)([^]*)");
  std::smatch parts;
  ASSERT_TRUE(std::regex_match(line, parts, kWords)) << "no command: " << line;
  const std::string way = parts[1], words = parts[2], program = parts[3], arguments = parts[4];
  const bool apart = way == "apart ";
  const bool cache = host_.ends_with(".kif") && IsTool(program) &&
                     (way == "" || way == "cached ") && words.find("ZELLIBS_HOST=") == words.npos;
  if (way != "cached ")
    Compare(command, RunCommand(words, program, arguments, host_, apart), "live");
  if (!cache) return;
  const std::string file = "zlkkiftools -c host.kif " + program;
  Compare(command, RunCommand(words, file, arguments, "none", apart), "cached");
}

void CaseTest::Compare(Part *command, const Lines &lines, const char *way) {
  if (lines == command->expected) return;
  const std::string expected = WriteFile("expected", Join(command->expected));
  const std::string actual = WriteFile("actual", Join(lines));
  const std::string what =
      command->text[0] + "  (" + way + ")\n" +
      Run({"diff", "-U2", "--label", "expected", "--label", "actual", expected, actual}).out;
  if (getenv("RENEW") == nullptr) {
    ADD_FAILURE_AT(case_.transcript->path.c_str(), command->line) << what;
    return;
  }
  std::cout << case_.transcript->path << ":" << command->line << ": " << what;
  command->expected = lines;
}

void CaseTest::Save() const {
  std::string text;
  for (const Part &part : case_.transcript->parts) text += Join(part.text) + Join(part.expected);
  if (ReadFile(case_.transcript->path) == text) return;
  std::ofstream(case_.transcript->path, std::ios::binary) << text;
}

// What stands before the first title belongs to every case.
std::vector<Case> ReadTranscript(Transcript *transcript) {
  std::vector<Case> cases(1);
  cases[0].transcript = transcript;
  std::ifstream stream(transcript->path);
  bool inOutput = false;
  int number = 0;
  for (std::string line; std::getline(stream, line);) {
    ++number;
    std::vector<Part> &parts = transcript->parts;
    if (line.starts_with("=== ")) {
      cases.push_back({transcript, line.substr(4), cases[0].host, {}});
      inOutput = false;
    } else if (line.starts_with("$ ")) {
      cases.back().commands.push_back(parts.size());
      parts.push_back({number, {line}, {}, true});
      inOutput = true;
      continue;
    } else if (inOutput && line.starts_with("> ") && parts.back().expected.empty()) {
      parts.back().text.push_back(line);
      continue;
    } else if (!line.empty() && line[0] != '#') {
      if (inOutput) {
        parts[cases.back().commands.back()].expected.push_back(line);
        continue;
      }
      cases.back().host.push_back(line);
    }
    parts.push_back({number, {line}});
  }
  return cases;
}

void RegisterTranscript(const std::filesystem::path &path) {
  static std::set<std::string> names;
  const auto word = [](std::string text) {
    for (char &c : text) c = isalnum(static_cast<unsigned char>(c)) ? c : '_';
    return text;
  };
  const std::string suite = word(path.parent_path().filename());
  static std::list<Transcript> transcripts;  // of which the tests have parts
  static std::list<Case> cases;
  transcripts.push_back({path, {}});
  Transcript *transcript = &transcripts.back();
  for (const Case &found : ReadTranscript(transcript)) {
    if (found.commands.empty()) continue;
#if defined(__SANITIZE_ADDRESS__)
    // That a right is missing is said once, by the tests of the release.
    if (IsApart(found) && !MayRunApart()) continue;
#endif
    const Case *one = &cases.emplace_back(found);
    std::string name = word(path.stem());
    if (!found.name.empty()) name += "/" + word(found.name);
    while (!names.insert(name).second) name += "_";
    testing::RegisterTest(suite.c_str(), name.c_str(), nullptr, nullptr, path.c_str(),
                          transcript->parts[found.commands[0]].line,
                          [one]() -> testing::Test * { return new CaseTest(*one); });
  }
}

}  // namespace

void RegisterTranscripts(const std::string &folder) {
  std::vector<std::filesystem::path> files;
  for (const auto &entry : std::filesystem::directory_iterator(folder)) {
    if (entry.path().extension() == ".transcript") files.push_back(entry.path());
  }
  std::sort(files.begin(), files.end());
  for (const auto &file : files) RegisterTranscript(file);
}
