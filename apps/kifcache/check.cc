#include "check.h"

#include <time.h>
#include <zlib.h>

#include <cinttypes>
#include <map>
#include <string>

#include "encoding.h"
#include "messages.h"
#include "progress.h"
#include "refusals.h"
#include "visit.h"

namespace {

struct Counts {
  uint64_t lists = 0;
  uint64_t records = 0;
  uint64_t contents = 0;
  uint64_t failing = 0;  // of all of them
};

// Remembers the facts and counts the answers.
class Counter : public Visitor {
 public:
  void OnHost(const Facts &facts) override { facts_ = facts; }
  void OnList(const VisitedNode &node, const Values &, KIF_Status status, const Values &) override {
    Count(node, &Counts::lists, Refusals::kList, status);
  }
  void OnRecord(const VisitedNode &node, const Values &, KIF_Status status,
                std::string_view) override {
    Count(node, &Counts::records, Refusals::kRecord, status);
  }
  void OnContent(const VisitedNode &node, const Values &, const cache::Stored &answer,
                 std::string_view) override {
    Count(node, &Counts::contents, Refusals::kContent, answer.read_status());
  }
  void OnSet(const VisitedNode &node, KIF_Status) override { ++counts_[node.path].failing; }

  const Facts &facts() const { return facts_; }
  const std::map<std::string, Counts> &counts() const { return counts_; }
  const Refusals &refusals() const { return refusals_; }

 private:
  void Count(const VisitedNode &node, uint64_t Counts::*what, Refusals::Kind kind,
             KIF_Status status) {
    progress_.Step(node.path);
    refusals_.Count(node, kind, status);
    Counts &counts = counts_[node.path];
    ++(counts.*what);
    if (status != 0) ++counts.failing;
  }

  Facts facts_;
  std::map<std::string, Counts> counts_;
  Refusals refusals_;
  Progress progress_{"answers"};
};

std::string Date(int64_t seconds) {
  const auto moment = static_cast<time_t>(seconds);
  struct tm parts;
  char date[64];
  if (moment != seconds || gmtime_r(&moment, &parts) == nullptr) return std::to_string(seconds);
  strftime(date, sizeof(date), "%Y-%m-%d %H:%M:%S UTC", &parts);
  return date;
}

// A fact without the quotes, which only matter where it is read back.
std::string Shown(const std::string &text) {
  const std::string quoted = Quoted(text);
  return quoted.substr(1, quoted.size() - 2);
}

void PrintConflict(const char *path, const char *what, void *stream) {
  fprintf(static_cast<FILE *>(stream), "%-10s %s: %s\n", "conflict", path, what);
}

std::string SentenceOf(cache::Reason reason) {
  switch (reason) {
    case cache::Reason::Unasked:
      return "not asked for";
    case cache::Reason::Rights:
      return "not permitted";
    case cache::Reason::Limits:
      return "too large";
    case cache::Reason::Time:
      return "not answered in time";
    case cache::Reason::Asleep:
      return "asleep, and not woken";
    case cache::Reason::Absent:
      return "the host has none";
  }
  return "reason " + ReasonText(reason);
}

// Whether this kifcache reads the file's nodes as their recorder meant them, and where not.
void PrintInterface(const CacheFile &file, const Facts &facts, FILE *stream) {
  const bool isOurs = facts.signature == InterfaceSignature() && HasSameCatalogue(file);
  const bool fits = FitsCatalogue(file, nullptr, nullptr);
  fprintf(stream, "%-10s 0x%016" PRIx64 "%s%s\n", "interface", facts.signature,
          isOurs && fits ? "" : ", not this kifcache's", !isOurs && fits ? ", but it fits" : "");
  FitsCatalogue(file, PrintConflict, stream);
}

void PrintLine(const char *label, const std::string &value, FILE *stream) {
  if (!value.empty()) fprintf(stream, "%-10s %s\n", label, value.c_str());
}

void PrintFacts(const CacheFile &file, const Facts &facts, FILE *stream) {
  PrintLine("format",
            std::to_string(file.header->major_version()) + "." +
                std::to_string(file.header->minor_version()),
            stream);
  PrintLine("host", Shown(facts.name), stream);
  std::string system;
  for (const std::string *text : {&facts.system, &facts.release, &facts.architecture}) {
    if (!system.empty() && !text->empty()) system += ' ';
    system += Shown(*text);
  }
  PrintLine("system", system, stream);
  PrintLine("kernel", Shown(facts.kernelBuildDate), stream);
  if (facts.begin != 0) {
    PrintLine("recorded", Date(facts.begin) + " to " + Date(facts.end), stream);
  }
  PrintLine("recorder", Shown(facts.recorder), stream);
  PrintLine("redacted", Shown(facts.redaction), stream);
  PrintInterface(file, facts, stream);
}

// What is missing in words, and with which rights it was asked for.
void PrintLacks(const Facts &facts, const Refusals &refusals, FILE *stream) {
  const bool mayHelp =
      refusals.HasForbidden() && facts.rights.starts_with("user ") && facts.redaction.empty();
  PrintLine("rights", Shown(facts.rights) + (mayHelp ? ": root records a whole picture" : ""),
            stream);
  for (const std::string &text : facts.omitted) PrintLine("omitted", Shown(text), stream);
  for (const Lack &lack : facts.lacks) {
    if (lack.reason == cache::Reason::Rights) continue;  // among the refused answers below
    std::string text = Shown(lack.what) + ": " + SentenceOf(lack.reason);
    if (lack.count != 0) text += ", " + std::to_string(lack.count) + " answers";
    if (lack.status != 0) text += std::string(", ") + ZLK_ReturnStatusToString(lack.status);
    PrintLine("lacks", text, stream);
  }
  std::string groups;
  for (const auto &[group, count] : refusals.groups()) {
    groups += (groups.empty() ? "" : ", ") + std::to_string(count) + " in " + Shown(group);
  }
  PrintLine("refused", groups.empty() ? "nothing" : groups, stream);
  for (const std::string &sentence : refusals.Sentences()) PrintLine("", Shown(sentence), stream);
}

void PrintCounts(const std::map<std::string, Counts> &counts, FILE *stream) {
  fprintf(stream, "\n%9s %9s %9s %9s  %s\n", "lists", "records", "contents", "failing", "node");
  for (const auto &[path, count] : counts) {
    fprintf(stream, "%9" PRIu64 " %9" PRIu64 " %9" PRIu64 " %9" PRIu64 "  %s\n", count.lists,
            count.records, count.contents, count.failing, Shown(path).c_str());
  }
}

}  // namespace

bool CheckFile(const char *path, const CacheFile &file, bool isVerbose, FILE *stream) {
  const auto *content = file.header->content();
  if (crc32_z(0, content->data(), content->size()) != file.header->checksum()) {
    return Complain(path, "damaged: its bytes do not have the checksum in it");
  }
  Counter counter;
  std::string problem;
  const bool isWhole = VisitAll(file, &counter, &problem);
  ClearProgress();
  if (!isWhole) {
    return Complain(path, "damaged: what it has of " + problem);
  }
  PrintFacts(file, counter.facts(), stream);
  PrintLacks(counter.facts(), counter.refusals(), stream);
  if (isVerbose) PrintCounts(counter.counts(), stream);
  return true;
}
