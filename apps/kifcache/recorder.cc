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

// The numbers behind the nodes are the library's.
const KIF_NodeId *const kNodeIds[kNodeCount] = {
#define NODE(path, ...) &KIF_NODE_##path,
#include "nodes.def"
#undef NODE
};

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
    if (candidate.offers.list.offered && length > longest &&
        strncmp(node.path, candidate.path, length) == 0 && node.path[length] == '_') {
      longest = length;
      above = IndexOf(candidate);
    }
  }
  return above;
}

// The value of an unsigned field of a record.
uint64_t FieldOf(const NodeInfo &node, const char *name, const std::string &record) {
  uint64_t value = 0;
  for (const NodeField *field = FieldsOf(node); field->name != nullptr; ++field) {
    if (strcmp(field->name, name) == 0) memcpy(&value, &record[field->offset], field->size);
  }
  return value;
}

// Whether the records of two nodes have the same instances, so that they are read together.
bool ShareInstances(const NodeInfo &left, const NodeInfo &right) {
  return !left.offers.list.offered && !right.offers.list.offered &&
         left.offers.instances == right.offers.instances && ListAbove(left) == ListAbove(right);
}

// Leaves every value once, in the order of their first places.
void DropRepeated(Values *values) {
  if (std::adjacent_find(values->begin(), values->end(), std::greater_equal<>()) == values->end()) {
    return;
  }
  std::set<Value> seen;
  std::erase_if(*values, [&seen](const Value &value) { return !seen.insert(value).second; });
}

class Recorder {
 public:
  Recorder(const RecordOptions &options, HostModel *model) : options_(options), model_(model) {}

  void Record();

 private:
  void RecordOwnLists(const NodeInfo &node);
  void RecordTogether(size_t first, size_t end);
  void RecordByPcpu(size_t first, size_t end);
  void RecordAnswers(size_t first, size_t end, const Values &instance);
  void RecordList(const NodeInfo &node, const Values &parent, Values *entries);
  void RecordRecord(const NodeInfo &node, const Values &instance, KIF_ParamList *selector);
  void RecordContent(const NodeInfo &node, const Values &instance, KIF_ParamList *selector);
  void Redact(NodeIndex node, std::string *record) const;

  const std::vector<Values> &ListInstances(NodeIndex list);
  const std::vector<Values> &Parents(const NodeInfo &node);
  std::vector<Values> Worlds();
  void AddCartelsOfWorlds();
  uint64_t CountPcpus();

  bool HasRoom(const NodeInfo &node);
  void TellOmitted();

  const RecordOptions &options_;
  HostModel *model_;
  // The instances of each list node, each once, as parameters from the outermost one on.
  bool walked_[kNodeCount] = {};
  std::vector<Values> instances_[kNodeCount];
  std::set<Values> cartelsOfWorlds_;
  uint64_t omitted_[kNodeCount] = {};
  Progress progress_{"answers"};
};

void Recorder::Record() {
  for (size_t row = 0; row < kNodeCount;) {
    const NodeInfo &node = kNodes[row];
    size_t end = row + 1;
    while (end < kNodeCount && ShareInstances(node, kNodes[end])) ++end;
    if (!node.offers.list.offered) {
      RecordTogether(row, end);
    } else if (!node.offers.record.offered) {
      ListInstances(IndexOf(node));
    } else {
      RecordOwnLists(node);
    }
    row = end;
  }
  TellOmitted();
}

// Whether there is room for another answer; those that find none are counted.
bool Recorder::HasRoom(const NodeInfo &node) {
  progress_.Step(node.path);
  if (model_->size() < kMostRecorded) return true;
  ++omitted_[IndexOf(node)];
  return false;
}

void Recorder::TellOmitted() {
  for (const NodeInfo &node : kNodes) {
    const uint64_t count = omitted_[IndexOf(node)];
    if (count == 0) continue;
    model_->facts.omitted.push_back(std::string(node.path) + ": " + std::to_string(count) +
                                    (count == 1 ? " answer" : " answers"));
  }
}

// Records the instances below `parent` and gives them in `*entries`; those of a failing list are
// none.
void Recorder::RecordList(const NodeInfo &node, const Values &parent, Values *entries) {
  entries->clear();
  if (!HasRoom(node)) return;
  const ParamListHandle selector = ListOf(parent);
  KIF_ParamList *fetched = nullptr;
  KIF_Status status = KIF_GetInstanceListAlloc(*kNodeIds[IndexOf(node)], selector.get(), &fetched);
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
  model_->AddList(IndexOf(node), parent, status, *entries);
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
  const NodeOffers &offers = node.offers;
  const ParameterTypes &parameters = offers.list.offered     ? offers.list
                                     : offers.record.offered ? offers.record
                                                             : offers.content;
  const NodeIndex above = ListAbove(node);
  return parameters.types[0] == '\0' || above == kNodeCount ? top : ListInstances(above);
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
  std::string record(node.offers.recordSize, '\0');
  const KIF_Status status =
      KIF_Get(KIF_NODE_hardware_cpu_cpuInfo, nullptr, record.data(), node.offers.recordSize);
  return status == 0 ? FieldOf(node, "numPcpus", record) : 0;
}

// Records the instances below each parent, and the record of each of them.
void Recorder::RecordOwnLists(const NodeInfo &node) {
  const bool byPlace = node.offers.instances == Instances::kOwnListIndex;
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
  switch (kNodes[first].offers.instances) {
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
    if (node.offers.record.offered) RecordRecord(node, instance, selector.get());
    if (node.offers.content.offered) RecordContent(node, instance, selector.get());
  }
}

void Recorder::RecordRecord(const NodeInfo &node, const Values &instance, KIF_ParamList *selector) {
  const NodeIndex index = IndexOf(node);
  std::string record(node.offers.recordSize, '\0');
  const KIF_Status status =
      KIF_Get(*kNodeIds[index], selector, record.data(), node.offers.recordSize);
  if (status == KIF_STATUS_NOT_FOUND) return;
  if (status != 0) record.clear();
  if (status == 0 && index == kNode_world_info) {
    const uint64_t cartel = FieldOf(node, "cartelID", record);
    if (cartel != 0) cartelsOfWorlds_.insert({IntegerValue(static_cast<int64_t>(cartel))});
  }
  if (options_.redact && status == 0) Redact(index, &record);
  model_->AddRecord(index, instance, status, record);
}

// Reads the content in chunks into `*bytes`. The result is that of the first chunk that fails.
KIF_Status ReadContent(KIF_NodeId node, KIF_ParamList *selector, uint32_t total,
                       std::string *bytes) {
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
  const KIF_NodeId id = *kNodeIds[IndexOf(node)];
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
  if (options_.redact && content.readStatus == 0) {
    content.bytes = Redacted();
    content.total = static_cast<uint32_t>(content.bytes.size());
  }
  model_->AddContent(IndexOf(node), instance, content);
}

// Puts `text` in the place of a text that stands in `size` bytes of a record.
void ReplaceText(std::string text, char *field, size_t size) {
  text.resize(std::min(text.size(), size - 1));
  text.resize(size, '\0');
  memcpy(field, text.data(), size);
}

void Recorder::Redact(NodeIndex node, std::string *record) const {
  char *bytes = record->data();
  switch (node) {
    case kNode_userworld_cartel_cmdline:
      return ReplaceText(RedactBehindFirstWord(bytes), bytes, record->size());
    case kNode_system_bootCmdLine:
      return ReplaceText(RedactBootCommandLine(bytes), bytes, record->size());
    case kNode_system_bootMAC:
      return ReplaceText(*bytes != '\0' ? Redacted() : "", bytes, record->size());
    case kNode_userworld_cartel_fd_fds: {
      auto *descriptor = reinterpret_cast<DescriptorRecord *>(bytes);
      if (strncmp(descriptor->kind, "SOCKET", sizeof(descriptor->kind)) != 0) return;
      return ReplaceText(RedactBehindFirstWord(descriptor->description), descriptor->description,
                         sizeof(descriptor->description));
    }
    default:
      return;
  }
}

int64_t Now() {
  const char *fixed = getenv("SOURCE_DATE_EPOCH");
  return fixed != nullptr ? strtoll(fixed, nullptr, 10) : time(nullptr);
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
  const uint32_t size = kNodes[kNode_world_info].offers.recordSize;
  std::string record(size, '\0');
  const KIF_Status status = KIF_Get(KIF_NODE_world_info, nobody.get(), record.data(), size);
  const bool isAnswer = status == KIF_STATUS_NOT_FOUND || status == KIF_STATUS_BAD_PARAMETER;
  return isAnswer || HostType_OSIsZLK() ? KIF_STATUS_OK : status;
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
  model->facts.begin = Now();
  Recorder(options, model).Record();
  model->facts.end = Now();
  uint32_t line;
  uint32_t firstLine;
  (void)model->Sort(&line, &firstLine);
  return true;
}
