#include "recorder.h"

#include <stdio.h>
#include <stdlib.h>
#include <sys/utsname.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <cinttypes>
#include <cstring>
#include <set>

#include "cache_bounds.h"
#include "kif/kif.h"
#include "progress.h"
#include "records/platform.h"
#include "records/worlds.h"
#include "redact.h"
#include "status.h"

namespace {

constexpr uint32_t kMostContent = uint32_t{64} << 20;
constexpr uint32_t kChunk = 3 << 20;                      // of a content that is asked for at once
constexpr uint64_t kMostPcpuRecords = uint64_t{2} << 20;  // a count may be anything
constexpr uint64_t kMostRecorded = kMostModelSize / 2;    // then answers are left out

// The numbers behind the nodes are the library's; those beyond the tools have no variable.
const KIF_NodeId *const kNodeIds[kNodeCount] = {
#define NODE(path, ...) &KIF_NODE_##path,
#define BEYOND(...) nullptr,
#include "nodes.def"
};

uint32_t NumberOf(NodeIndex node) {
  return kNodeIds[node] != nullptr ? *kNodeIds[node] : node + 1u;
}

// Whether the library's catalogue is this one, so that it numbers the nodes without a variable so.
bool HasOurCatalogue() {
  uint64_t hash = 0;
  return KIF_Get(kCatalogueNumber, nullptr, &hash, sizeof(hash)) == 0 && hash == CatalogueHash();
}

[[noreturn]] void OutOfMemory() {
  fputs("kifcache: out of memory\n", stderr);
  exit(1);
}

// The selecting list of `values`.
ParamListHandle ListOf(const Values &values) {
  ParamListHandle list = CreateInstance();
  if (list == nullptr) OutOfMemory();
  for (const Value &value : values) {
    const KIF_Status status =
        value.kind == cache::Kind::Integer
            ? KIF_ParamListAddInt(list.get(), value.integer)
            : KIF_ParamListAddString(
                  list.get(), value.kind == cache::Kind::Text ? value.text.c_str() : nullptr);
    if (status != 0) OutOfMemory();
  }
  return list;
}

Values Joined(const Values &values, Value last) {
  Values joined = values;
  joined.push_back(std::move(last));
  return joined;
}

// The list node whose instances a node stands below: the one with the longest path that begins the
// node's; kNodeCount where there is none.
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
  return above;
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

constexpr int64_t kNanoseconds = 1000000000;

// Moments of the recording. SOURCE_DATE_EPOCH fixes those of the wall clock, in seconds, and takes
// away what differs from run to run; the time since the boot is that of this machine alone.
class Clock {
 public:
  explicit Clock(bool isThisMachine)
      : fixed_(secure_getenv("SOURCE_DATE_EPOCH")),
        tellsBoot_(isThisMachine && fixed_ == nullptr) {}

  bool isFixed() const { return fixed_ != nullptr; }
  Moments Begin(const char *name) const {
    const int64_t now = Now();
    const int64_t sinceBoot = SinceBoot();
    return {name, now, now, sinceBoot, sinceBoot};
  }
  void End(Moments *of) const {
    of->end = Now();
    of->endSinceBoot = SinceBoot();
  }

 private:
  static int64_t Read(clockid_t clock) {
    struct timespec time = {};
    clock_gettime(clock, &time);
    return int64_t{time.tv_sec} * kNanoseconds + time.tv_nsec;
  }
  int64_t Now() const {
    return fixed_ != nullptr ? strtoll(fixed_, nullptr, 10) * kNanoseconds : Read(CLOCK_REALTIME);
  }
  int64_t SinceBoot() const { return tellsBoot_ ? Read(CLOCK_BOOTTIME) : 0; }

  const char *const fixed_;
  const bool tellsBoot_;
};

class Recorder {
 public:
  Recorder(const RecordOptions &options, const Clock &clock, HostModel *model)
      : options_(options), clock_(clock), model_(model) {
    for (const NodeInfo &node : kNodes) models_[IndexOf(node)] = model->NodeOf(node.path);
  }

  void Record();

 private:
  void RecordRows(size_t first, size_t end);
  Moments *MomentsOf(Group group);
  void RecordOwnLists(const NodeInfo &node);
  void RecordTogether(size_t first, size_t end);
  void RecordByPcpu(size_t first, size_t end);
  void RecordAnswers(size_t first, size_t end, const Values &instance);
  void RecordList(const NodeInfo &node, const Values &parent, Values *entries);
  void RecordRecord(const NodeInfo &node, const Values &instance, KIF_ParamList *selector);
  void RecordContent(const NodeInfo &node, const Values &instance, KIF_ParamList *selector);

  const std::vector<Values> &ListInstances(NodeIndex list);
  const std::vector<Values> &Parents(const NodeInfo &node);
  std::vector<Values> Worlds();
  void AddCartelsOfWorlds();
  uint64_t CountPcpus();

  bool HasRoom(const NodeInfo &node);
  void TellLacks();

  const RecordOptions &options_;
  const Clock &clock_;
  HostModel *model_;
  NodeModel *models_[kNodeCount];
  const bool hasOurCatalogue_ = HasOurCatalogue();
  // The instances of each list node, each once, as parameters from the outermost one on.
  bool walked_[kNodeCount] = {};
  std::vector<Values> instances_[kNodeCount];
  std::set<Values> cartelsOfWorlds_;
  uint64_t omitted_[kNodeCount] = {};
  uint64_t refused_[kNodeCount] = {};
  Progress progress_{"answers"};
};

void Recorder::Record() {
  for (size_t row = 0; row < kNodeCount;) {
    const NodeInfo &node = kNodes[row];
    size_t end = row + 1;
    while (end < kNodeCount && ShareInstances(node, kNodes[end])) ++end;
    RecordRows(row, end);
    row = end;
  }
  TellLacks();
}

// Records the rows from `first` up to `end`, which are of one group and share their instances.
void Recorder::RecordRows(size_t row, size_t end) {
  const NodeInfo &node = kNodes[row];
  if (!node.hasVariable && !hasOurCatalogue_) return;
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
    if (!node.hasVariable && !hasOurCatalogue_) {
      lacks.push_back({node.path, cache::Reason::Unasked, 0, 0});
    }
    if (refused != 0) {
      lacks.push_back({node.path, cache::Reason::Rights, KIF_STATUS_NO_PERMISSION, refused});
    }
    if (omitted != 0) lacks.push_back({node.path, cache::Reason::Limits, 0, omitted});
  }
}

// Records the instances below `parent` and gives them in `*entries`; those of a failing list are
// none.
void Recorder::RecordList(const NodeInfo &node, const Values &parent, Values *entries) {
  entries->clear();
  if (!HasRoom(node)) return;
  const ParamListHandle selector = ListOf(parent);
  KIF_ParamList *fetched = nullptr;
  KIF_Status status = KIF_GetInstanceListAlloc(NumberOf(IndexOf(node)), selector.get(), &fetched);
  if (status == 0 && fetched == nullptr) status = KIF_STATUS_FAILURE;
  if (status == KIF_STATUS_NOT_FOUND) return;
  const ParamListHandle list(status == 0 ? fetched : nullptr);
  const int32_t count = status == 0 ? KIF_ParamListUsedCount(list.get()) : 0;
  for (int32_t i = 0; i < count; ++i) {
    KIF_Param *param = KIF_ParamListGetParam(list.get(), static_cast<uint32_t>(i));
    if (param != nullptr && param->type == KIF_PARAM_INTEGER) {
      entries->push_back(IntegerValue(KIF_ParamGetInt(param)));
    } else if (param != nullptr && param->type == KIF_PARAM_STRING) {
      entries->push_back(TextValue(KIF_ParamGetString(param)));
    } else {
      ++omitted_[IndexOf(node)];
    }
  }
  // A tree of files may name a process twice.
  if (EntriesSelect(node)) DropRepeated(entries);
  if (status == KIF_STATUS_NO_PERMISSION) ++refused_[IndexOf(node)];
  model_->AddList(models_[IndexOf(node)], parent, status, *entries);
}

// Walks the lists of a node, the first time it is asked for.
const std::vector<Values> &Recorder::ListInstances(NodeIndex list) {
  if (walked_[list]) return instances_[list];
  walked_[list] = true;
  Values entries;
  for (const Values &parent : Parents(kNodes[list])) {
    RecordList(kNodes[list], parent, &entries);
    DropRepeated(&entries);
    for (Value &entry : entries) instances_[list].push_back(Joined(parent, std::move(entry)));
  }
  return instances_[list];
}

// The instances that a node stands below; the one without parameters at the top.
const std::vector<Values> &Recorder::Parents(const NodeInfo &node) {
  static const std::vector<Values> top(1);
  const size_t count = node.hasLists ? CountOfListParameters(node) : node.parameterCount;
  const NodeIndex above = ListAbove(node);
  return count == 0 || above == kNodeCount ? top : ListInstances(above);
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
  const NodeInfo &node = kNodes[kNode_hardware_cpu_cpuInfo];
  std::string record(node.recordSize, '\0');
  const KIF_Status status =
      KIF_Get(KIF_NODE_hardware_cpu_cpuInfo, nullptr, record.data(), node.recordSize);
  return status == 0 ? FieldOf(node, "numPcpus", record) : 0;
}

// Records the instances below each parent, and the record of each of them.
void Recorder::RecordOwnLists(const NodeInfo &node) {
  const bool byPlace = node.instances == Instances::kOwnListIndex;
  const size_t row = IndexOf(node);
  Values entries;
  for (const Values &parent : Parents(node)) {
    RecordList(node, parent, &entries);
    if (!byPlace) DropRepeated(&entries);
    int64_t place = 0;
    for (const Value &entry : entries) {
      RecordAnswers(row, row + 1, Joined(parent, byPlace ? IntegerValue(place++) : entry));
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
  const ParamListHandle selector = instance.empty() ? nullptr : ListOf(instance);
  for (size_t row = first; row < end; ++row) {
    const NodeInfo &node = kNodes[row];
    if (!HasRoom(node)) continue;
    if (node.hasRecords) RecordRecord(node, instance, selector.get());
    if (node.hasContents) RecordContent(node, instance, selector.get());
  }
}

void Recorder::RecordRecord(const NodeInfo &node, const Values &instance, KIF_ParamList *selector) {
  const NodeIndex index = IndexOf(node);
  std::string record(node.recordSize, '\0');
  const KIF_Status status = KIF_Get(NumberOf(index), selector, record.data(), node.recordSize);
  if (status == KIF_STATUS_NOT_FOUND) return;
  if (status == KIF_STATUS_NO_PERMISSION) ++refused_[index];
  if (status != 0) record.clear();
  if (status == 0 && index == kNode_world_info) {
    const uint64_t cartel = FieldOf(node, "cartelID", record);
    if (cartel != 0) cartelsOfWorlds_.insert({IntegerValue(static_cast<int64_t>(cartel))});
  }
  if (options_.redact && status == 0) RedactRecord(node, &record);
  model_->AddRecord(models_[index], instance, status, record);
}

// Reads the content in chunks into `*bytes`. The result is that of the first chunk that fails.
KIF_Status ReadContent(uint32_t node, KIF_ParamList *selector, uint32_t total, std::string *bytes) {
  const uint32_t wanted = std::min(total, kChunk);
  while (bytes->size() < total) {
    const uint32_t request[] = {static_cast<uint32_t>(bytes->size()), wanted};
    const DataHandle input(KIFData_Create(sizeof(request), request, sizeof(request)));
    const DataHandle output(KIFData_Create(wanted + 1, nullptr, 0));
    if (input == nullptr || output == nullptr) OutOfMemory();
    const KIF_Status status = KIF_SetData(node, selector, input.get(), output.get());
    if (status != 0) return status;
    const uint32_t given = std::min(output->length, wanted);
    if (given == 0) break;
    const void *read = KIFData_GetData(output.get());
    if (read == nullptr) OutOfMemory();
    bytes->append(static_cast<const char *>(read), given);
  }
  return 0;
}

void Recorder::RecordContent(const NodeInfo &node, const Values &instance,
                             KIF_ParamList *selector) {
  const uint32_t id = NumberOf(IndexOf(node));
  ContentAnswer content;
  content.lengthStatus = KIF_GetDataLength(id, selector, &content.total);
  if (content.lengthStatus == KIF_STATUS_NOT_FOUND) return;
  if (content.lengthStatus != 0) {
    content.readStatus = content.lengthStatus;
    content.total = 0;
  } else if (content.total > kMostContent) {
    content.readStatus = KIF_STATUS_TOO_LARGE;
    ++omitted_[IndexOf(node)];
  } else {
    content.readStatus = ReadContent(id, selector, content.total, &content.bytes);
    if (content.readStatus != 0) content.bytes.clear();
  }
  if (content.readStatus == KIF_STATUS_NO_PERMISSION) ++refused_[IndexOf(node)];
  if (options_.redact && content.readStatus == 0) {
    RedactContent(node, &content.bytes);
    content.total = static_cast<uint32_t>(content.bytes.size());
  }
  model_->AddContent(models_[IndexOf(node)], instance, content);
}

// The host may be a file or a tree of files from elsewhere. No node has the name of the machine,
// but one has the release of its kernel: where that is not this machine's, nothing else here is
// either.
void TellOfMachine(Facts *facts) {
  VersionRecord version = {};
  struct utsname names;
  const bool isKnown = KIF_Get(KIF_NODE_system_version, nullptr, &version, sizeof(version)) == 0;
  version.product[sizeof(version.product) - 1] = version.version[sizeof(version.version) - 1] = 0;
  facts->system = version.product;
  facts->release = version.version;
  if (uname(&names) == 0 && (HostType_OSIsZLK() || !isKnown || facts->release == names.release)) {
    facts->name = names.nodename;
    facts->system = names.sysname;
    facts->release = names.release;
    facts->architecture = names.machine;
  }
  facts->recorder = "kifcache " KIFCACHE_VERSION;
  facts->rights = geteuid() == 0 ? "root" : "user " + std::to_string(geteuid());
}

// Whether the host can be asked at all. A world that no host has is refused or not found; any other
// answer says what is wrong with the host itself, such as a file that is none.
KIF_Status StatusOfHost() {
  const ParamListHandle nobody = ListOf({IntegerValue(-1), IntegerValue(-1)});
  const uint32_t size = kNodes[kNode_world_info].recordSize;
  std::string record(size, '\0');
  const KIF_Status status = KIF_Get(KIF_NODE_world_info, nobody.get(), record.data(), size);
  const bool isAnswer = status == KIF_STATUS_NOT_FOUND || status == KIF_STATUS_BAD_PARAMETER;
  return isAnswer || HostType_OSIsZLK() ? KIF_STATUS_OK : status;
}

// What only this machine has, where it is the host.
void TellOfBoot(const Clock &clock, Facts *facts) {
  char bootID[37] = "";
  FILE *file = fopen("/proc/sys/kernel/random/boot_id", "re");
  if (file != nullptr && fgets(bootID, sizeof(bootID), file) != nullptr) facts->bootID = bootID;
  if (file != nullptr) fclose(file);
  if (!clock.isFixed()) facts->recorderCartel = getpid();
}

}  // namespace

bool RecordHost(const RecordOptions &options, HostModel *model) {
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
  TellOfMachine(&model->facts);
  model->facts.kernelBuildDate = date;
  const bool isThisMachine = KIF_HostIsForeign == nullptr || !KIF_HostIsForeign();
  const Clock clock(isThisMachine);
  if (isThisMachine) TellOfBoot(clock, &model->facts);
  if (options.redact) model->facts.redaction = kRedactionRules;
  Moments whole = clock.Begin("recording");
  Recorder(options, clock, model).Record();
  clock.End(&whole);
  model->facts.begin = whole.begin / kNanoseconds;
  model->facts.end = whole.end / kNanoseconds;
  model->facts.moments.insert(model->facts.moments.begin(), whole);
  uint32_t line;
  uint32_t firstLine;
  (void)model->Sort(&line, &firstLine);
  return true;
}
