#include "recorder.h"

#include <stdio.h>

#include <algorithm>
#include <cinttypes>
#include <cstring>
#include <set>

#include "cache_bounds.h"
#include "host_answer.h"
#include "kif/kif.h"
#include "machine_facts.h"
#include "progress.h"
#include "redact.h"
#include "status.h"

namespace {

constexpr uint64_t kMostPcpuRecords = uint64_t{2} << 20;  // a count may be anything
constexpr uint64_t kMostRecorded = kMostModelSize / 2;    // then answers are left out

Values Joined(const Values &values, Value last) {
  Values joined = values;
  joined.push_back(std::move(last));
  return joined;
}

// How many parameters of a node the list has given that it stands below.
size_t CountOfParents(const NodeInfo &node) {
  return node.hasLists ? CountOfListParameters(node) : node.parameterCount;
}

// Whether a node lists just what another one stands below.
bool ListsParentsOf(const NodeInfo &node, const NodeInfo &list) {
  const size_t count = CountOfParents(node);
  return list.hasLists && list.parameterCount == count &&
         std::equal(node.parameters, node.parameters + count, list.parameters);
}

// The list node whose instances a node stands below: the one with the longest path that begins the
// node's, else the first that lists what the node's parameters select; kNodeCount where there is
// none.
NodeIndex ListAbove(const NodeInfo &node) {
  NodeIndex above = kNodeCount;
  size_t longest = 0;
  for (const NodeInfo &candidate : kNodes) {
    const size_t length = strlen(candidate.path);
    if (candidate.hasLists && length > longest && strncmp(node.path, candidate.path, length) == 0 &&
        node.path[length] == '_') {
      longest = length;
      above = IndexOf(candidate);
    }
  }
  if (above != kNodeCount || node.hasVariable) return above;
  const NodeInfo *list = std::find_if(kNodes, kNodes + kNodeCount, [&node](const NodeInfo &other) {
    return ListsParentsOf(node, other);
  });
  return static_cast<NodeIndex>(list - kNodes);
}

// Whether other nodes stand below the instances of a node.
bool IsAboveOthers(NodeIndex list) {
  return std::any_of(kNodes, kNodes + kNodeCount, [list](const NodeInfo &node) {
    return node.parameterCount > 0 && IndexOf(node) != list && ListAbove(node) == list;
  });
}

// The value of an unsigned field of a record.
uint64_t FieldOf(const NodeInfo &node, const char *name, const std::string &record) {
  uint64_t value = 0;
  const NodeField *fields = FieldsOf(node);
  for (const NodeField *field = fields; field < fields + node.fieldCount; ++field) {
    if (strcmp(field->name, name) == 0) memcpy(&value, &record[field->offset], field->size);
  }
  return value;
}

// Whether the records of two nodes have the same instances, so that they are read together.
bool ShareInstances(const NodeInfo &left, const NodeInfo &right) {
  return !left.hasLists && !right.hasLists && left.group == right.group &&
         left.instances == right.instances && ListAbove(left) == ListAbove(right);
}

// Leaves every value once, in the order of their first places.
void DropRepeated(Values *values) {
  if (std::adjacent_find(values->begin(), values->end(), std::greater_equal<>()) == values->end()) {
    return;
  }
  std::set<Value> seen;
  std::erase_if(*values, [&seen](const Value &value) { return !seen.insert(value).second; });
}

// Whether an answer shows that there is something to record; an empty list of worlds tells at least
// that somebody looked.
bool IsSubject(const Question &question, const HostAnswer &answer) {
  if (question.kind != AnswerKind::kList) return question.node == kNode_hardware_cpu_cpuInfo;
  return question.node == kNode_world || !answer.entries.empty();
}

class Recorder {
 public:
  Recorder(const RecordingClock &clock, HostModel *model) : clock_(clock), model_(model) {
    for (const NodeInfo &node : kNodes) models_[IndexOf(node)] = model->NodeOf(node.path);
  }

  // False where the host has neither processes nor devices.
  bool Record();

 private:
  // Asks for one answer and stores it; all the rest finds out what to ask for.
  void RecordAnswer(const Question &question, HostAnswer *answer);
  void Store(const Question &question, const HostAnswer &answer);

  void RecordRows(size_t first, size_t end);
  Moments *MomentsOf(Group group);
  void RecordOwnLists(const NodeInfo &node);
  void RecordTogether(size_t first, size_t end);
  void RecordByPcpu(size_t first, size_t end);
  void RecordAnswers(size_t first, size_t end, const Values &instance);
  void NoteCartel(const std::string &record);
  Values RecordList(const NodeInfo &node, const Values &parent);

  const std::vector<Values> &ListInstances(NodeIndex list);
  const std::vector<Values> &Parents(const NodeInfo &node);
  std::vector<Values> Worlds();
  void AddCartelsOfWorlds();
  uint64_t CountPcpus();

  bool HasRoom(const NodeInfo &node);
  void TellLacks();

  const RecordingClock &clock_;
  HostModel *model_;
  NodeModel *models_[kNodeCount];
  Asker asker_;
  // The instances of each list node, each once, as parameters from the outermost one on.
  bool walked_[kNodeCount] = {};
  std::vector<Values> instances_[kNodeCount];
  std::set<Values> cartelsOfWorlds_;
  uint64_t omitted_[kNodeCount] = {};
  uint64_t refused_[kNodeCount] = {};
  bool isAbsent_[kNodeCount] = {};
  bool hasSubjects_ = false;
  Progress progress_{"answers"};
};

bool Recorder::Record() {
  for (size_t row = 0; row < kNodeCount;) {
    const NodeInfo &node = kNodes[row];
    size_t end = row + 1;
    while (end < kNodeCount && ShareInstances(node, kNodes[end])) ++end;
    RecordRows(row, end);
    row = end;
  }
  TellLacks();
  return hasSubjects_;
}

// Records the rows from `first` up to `end`, which are of one group and share their instances.
void Recorder::RecordRows(size_t row, size_t end) {
  const NodeInfo &node = kNodes[row];
  if (!asker_.Knows(node)) return;
  Moments *of = MomentsOf(node.group);
  if (!node.hasLists) {
    RecordTogether(row, end);
  } else if (!node.hasRecords) {
    ListInstances(IndexOf(node));
  } else {
    RecordOwnLists(node);
  }
  clock_.End(of);
}

Moments *Recorder::MomentsOf(Group group) {
  std::vector<Moments> &all = model_->facts.moments;
  const auto known = std::find_if(
      all.begin(), all.end(), [group](const Moments &of) { return of.name == GroupName(group); });
  if (known != all.end()) return &*known;
  return &all.emplace_back(clock_.Begin(GroupName(group)));
}

// Whether there is room for another answer; those that find none are counted.
bool Recorder::HasRoom(const NodeInfo &node) {
  progress_.Step(node.path);
  if (model_->size() < kMostRecorded) return true;
  ++omitted_[IndexOf(node)];
  return false;
}

void Recorder::TellLacks() {
  std::vector<Lack> &lacks = model_->facts.lacks;
  for (const NodeInfo &node : kNodes) {
    const uint64_t refused = refused_[IndexOf(node)];
    const uint64_t omitted = omitted_[IndexOf(node)];
    if (!asker_.Knows(node)) {
      lacks.push_back({node.path, cache::Reason::Unasked, 0, 0});
    }
    if (refused != 0) {
      lacks.push_back({node.path, cache::Reason::Rights, KIF_STATUS_NO_PERMISSION, refused});
    }
    if (isAbsent_[IndexOf(node)]) {
      lacks.push_back({node.path, cache::Reason::Absent, KIF_STATUS_NOT_FOUND, 1});
    }
    if (omitted != 0) lacks.push_back({node.path, cache::Reason::Limits, 0, omitted});
  }
}

void Recorder::RecordAnswer(const Question &question, HostAnswer *answer) {
  const NodeInfo &node = kNodes[question.node];
  if (!HasRoom(node)) {
    *answer = {};
    answer->status = KIF_STATUS_NOT_FOUND;
    return;
  }
  asker_.Ask(question, answer);
  // What was listed and is gone has the answer of a live host.
  if (question.node == kNode_userworld_cartel_cmdline && answer->status == KIF_STATUS_NOT_FOUND) {
    answer->status = KIF_STATUS_NO_COMMAND_LINE;
  }
  hasSubjects_ = hasSubjects_ || (answer->status == 0 && IsSubject(question, *answer));
  // A tree of files may name a process twice.
  if (question.kind == AnswerKind::kList && EntriesSelect(node)) DropRepeated(&answer->entries);
  Store(question, *answer);
}

// What is not found is what a file answers anyway.
void Recorder::Store(const Question &question, const HostAnswer &answer) {
  NodeModel *model = models_[question.node];
  omitted_[question.node] += answer.omitted;
  if (answer.status == KIF_STATUS_NO_PERMISSION) ++refused_[question.node];
  if (question.kind == AnswerKind::kContent) {
    if (answer.content.lengthStatus == KIF_STATUS_NOT_FOUND) return;
    model_->AddContent(model, question.instance, answer.content);
  } else if (answer.status == KIF_STATUS_NOT_FOUND) {
    // A whole subject of the tools that the host does not have.
    const bool isWhole = question.kind == AnswerKind::kList && question.instance.empty();
    if (isWhole && kNodes[question.node].hasVariable) isAbsent_[question.node] = true;
  } else if (question.kind == AnswerKind::kList) {
    model_->AddList(model, question.instance, answer.status, answer.entries);
  } else {
    model_->AddRecord(model, question.instance, answer.status, answer.record);
  }
}

// Records the instances below `parent`; those of a failing list are none.
Values Recorder::RecordList(const NodeInfo &node, const Values &parent) {
  HostAnswer answer;
  RecordAnswer({IndexOf(node), AnswerKind::kList, parent}, &answer);
  return std::move(answer.entries);
}

// Walks the lists of a node, the first time it is asked for.
const std::vector<Values> &Recorder::ListInstances(NodeIndex list) {
  if (walked_[list]) return instances_[list];
  walked_[list] = true;
  for (const Values &parent : Parents(kNodes[list])) {
    Values entries = RecordList(kNodes[list], parent);
    DropRepeated(&entries);
    for (Value &entry : entries) instances_[list].push_back(Joined(parent, std::move(entry)));
  }
  return instances_[list];
}

// The instances that a node stands below; the one without parameters at the top.
const std::vector<Values> &Recorder::Parents(const NodeInfo &node) {
  static const std::vector<Values> top(1);
  const NodeIndex above = ListAbove(node);
  return CountOfParents(node) == 0 || above == kNodeCount ? top : ListInstances(above);
}

// A cartel's ID stands for its main world.
std::vector<Values> Recorder::Worlds() {
  std::vector<Values> worlds = ListInstances(kNode_world);
  const std::set<Values> known(worlds.begin(), worlds.end());
  for (const Values &cartel : ListInstances(kNode_userworld_cartel)) {
    if (!known.contains(cartel)) worlds.push_back(cartel);
  }
  return worlds;
}

// The tools also ask for the cartels that the records of worlds name, listed or not.
void Recorder::AddCartelsOfWorlds() {
  std::vector<Values> &cartels = instances_[kNode_userworld_cartel];
  for (const Values &cartel : cartels) cartelsOfWorlds_.erase(cartel);
  cartels.insert(cartels.end(), cartelsOfWorlds_.begin(), cartelsOfWorlds_.end());
}

uint64_t Recorder::CountPcpus() {
  HostAnswer answer;
  asker_.Ask({kNode_hardware_cpu_cpuInfo, AnswerKind::kRecord, {}}, &answer);
  if (answer.status != 0) return 0;
  return FieldOf(kNodes[kNode_hardware_cpu_cpuInfo], "numPcpus", answer.record);
}

// Records the instances below each parent, and the record of each of them.
void Recorder::RecordOwnLists(const NodeInfo &node) {
  const bool byPlace = node.instances == Instances::kOwnListIndex;
  const NodeIndex row = IndexOf(node);
  const bool kept = !byPlace && IsAboveOthers(row);
  walked_[row] = kept;
  for (const Values &parent : Parents(node)) {
    Values entries = RecordList(node, parent);
    if (!byPlace) DropRepeated(&entries);
    int64_t place = 0;
    for (const Value &entry : entries) {
      const Values instance = Joined(parent, byPlace ? IntegerValue(place++) : entry);
      RecordAnswers(row, row + 1u, instance);
      if (kept) instances_[row].push_back(instance);
    }
  }
}

// Records the nodes in the rows from `first` up to `end`, which share their instances: what
// belongs to one instance is read at one time.
void Recorder::RecordTogether(size_t first, size_t end) {
  switch (kNodes[first].instances) {
    case Instances::kGroupZero:
      return RecordAnswers(first, end, {IntegerValue(0)});
    case Instances::kWorlds:
      for (const Values &world : Worlds()) RecordAnswers(first, end, world);
      return AddCartelsOfWorlds();
    case Instances::kParentByPcpu:
      return RecordByPcpu(first, end);
    default:
      for (const Values &parent : Parents(kNodes[first])) RecordAnswers(first, end, parent);
  }
}

void Recorder::RecordByPcpu(size_t first, size_t end) {
  const std::vector<Values> &parents = Parents(kNodes[first]);
  if (parents.empty()) return;
  const uint64_t all = CountPcpus();
  const uint64_t kept = std::min(all, kMostPcpuRecords / parents.size());
  omitted_[first] += (all - kept) * parents.size();
  for (const Values &parent : parents) {
    for (uint64_t pcpu = 0; pcpu < kept; ++pcpu) {
      RecordAnswers(first, end, Joined(parent, IntegerValue(static_cast<int64_t>(pcpu))));
    }
  }
}

void Recorder::RecordAnswers(size_t first, size_t end, const Values &instance) {
  HostAnswer answer;
  for (size_t row = first; row < end; ++row) {
    const auto node = static_cast<NodeIndex>(row);
    if (kNodes[row].hasRecords) {
      RecordAnswer({node, AnswerKind::kRecord, instance}, &answer);
      if (node == kNode_world_info && answer.status == 0) NoteCartel(answer.record);
    }
    if (kNodes[row].hasContents) RecordAnswer({node, AnswerKind::kContent, instance}, &answer);
  }
}

// Notes the cartel that the record of a world names.
void Recorder::NoteCartel(const std::string &record) {
  const uint64_t cartel = FieldOf(kNodes[kNode_world_info], "cartelID", record);
  if (cartel != 0) cartelsOfWorlds_.insert({IntegerValue(static_cast<int64_t>(cartel))});
}

// Whether the present host can be recorded, and the build date of its kernel; says why not.
bool CanBeRecorded(std::string *kernelBuildDate) {
  if (!HostType_OSIsZLK() && !HostType_OSIsSimulator()) {
    fputs("kifcache: there is no host to record\n", stderr);
    return false;
  }
  ZlkSyscall_Init(1, 0, 0);
  char date[sizeof(kInterfaceDate)] = "";
  const char *libraryDate = "";
  KIF_Status status = KIF_CheckSig(date, sizeof(date), &libraryDate);
  if (status == 0) status = StatusOfHost();
  if (status != 0) {
    fprintf(stderr, "kifcache: the host cannot be recorded: %s\n",
            ZLK_ReturnStatusToString(status));
    return false;
  }
  date[sizeof(date) - 1] = '\0';
  *kernelBuildDate = date;
  return true;
}

}  // namespace

bool RecordHost(HostModel *model) {
  Facts &facts = model->facts;
  if (!CanBeRecorded(&facts.kernelBuildDate)) return false;
  TellOfMachine(&facts);
  const bool isThisMachine = KIF_HostIsForeign == nullptr || !KIF_HostIsForeign();
  const RecordingClock clock(isThisMachine);
  if (isThisMachine) TellOfBoot(clock, &facts);
  Moments whole = clock.Begin("recording");
  if (!Recorder(clock, model).Record()) {
    fputs("kifcache: the host has neither processes nor devices to record\n", stderr);
    return false;
  }
  clock.End(&whole);
  facts.begin = whole.begin / kNanoseconds;
  facts.end = whole.end / kNanoseconds;
  facts.moments.insert(facts.moments.begin(), whole);
  uint32_t line;
  uint32_t firstLine;
  (void)model->Sort(&line, &firstLine);
  return true;
}
