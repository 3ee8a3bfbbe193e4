// network_counters: the rows of net/snmp and net/netstat.
#include <fcntl.h>

#include <algorithm>
#include <cstring>
#include <string_view>

#include "base/array.h"
#include "base/everlasting.h"
#include "linux/linux_nodes.h"
#include "linux/network_namespaces.h"
#include "records/network.h"

namespace {

struct Counter {
  char name[64];  // "Tcp.RetransSegs"
  int64_t value;
};

// Those of the namespace that was listed last.
struct Counters {
  int64_t network = 0;
  Array<Counter> all;  // by name
};

Everlasting<Counters> snapshot;

// Cuts the next word off a line; empty at its end.
std::string_view TakeWord(std::string_view *line) {
  line->remove_prefix(std::min(line->find_first_not_of(' '), line->size()));
  const std::string_view word(line->data(), std::min(line->find(' '), line->size()));
  line->remove_prefix(word.size());
  return word;
}

bool TakeValue(std::string_view word, int64_t *value) {
  const bool isNegative = !word.empty() && word[0] == '-';
  if (isNegative) word.remove_prefix(1);
  uint64_t number = 0;
  const char *place = word.data();
  if (word.empty() || !TakeNumber(&place, &number) || number > INT64_MAX) return false;
  *value = isNegative ? -static_cast<int64_t>(number) : static_cast<int64_t>(number);
  return true;
}

// A row is two lines: "Tcp: ActiveOpens PassiveOpens" and "Tcp: 7 8".
KIF_Status TakeRow(std::string_view names, std::string_view values) {
  std::string_view row = TakeWord(&names);
  if (row.empty() || row.back() != ':' || TakeWord(&values) != row) return KIF_STATUS_OK;
  row.remove_suffix(1);
  while (true) {
    const std::string_view name = TakeWord(&names);
    Counter counter = {};
    if (name.empty() || !TakeValue(TakeWord(&values), &counter.value)) return KIF_STATUS_OK;
    if (row.size() + 1 + name.size() >= sizeof(counter.name)) continue;
    memcpy(counter.name, row.data(), row.size());
    counter.name[row.size()] = '.';
    memcpy(counter.name + row.size() + 1, name.data(), name.size());
    if (!snapshot->all.Append(counter)) return KIF_STATUS_NO_MEMORY;
  }
}

std::string_view TakeLine(const char **text) {
  const std::string_view line(*text, strcspn(*text, "\n"));
  *text += line.size();
  if (**text == '\n') ++*text;
  return line;
}

KIF_Status ReadFile(const Network &network, const char *name) {
  Descriptor file;
  Bytes text;
  KIF_Status status = OpenNetworkFile(network, name, &file);
  if (status == KIF_STATUS_OK) status = ReadWhole(file, &text, size_t{1} << 20);
  for (const char *place = text.text(); status == KIF_STATUS_OK && *place != '\0';) {
    const std::string_view names = TakeLine(&place);
    status = TakeRow(names, TakeLine(&place));
  }
  return status;
}

KIF_Status ReadCounters(int64_t number) {
  snapshot->network = 0;
  snapshot->all.Clear();
  const Network *network;
  KIF_Status status = FindNetwork(number, &network);
  if (status == KIF_STATUS_OK) status = ReadFile(*network, "snmp");
  const KIF_Status more = status == KIF_STATUS_OK ? ReadFile(*network, "netstat") : status;
  if (more != KIF_STATUS_NOT_FOUND) status = more;
  if (status != KIF_STATUS_OK) return status;
  std::sort(snapshot->all.begin(), snapshot->all.end(),
            [](const Counter &a, const Counter &b) { return strcmp(a.name, b.name) < 0; });
  snapshot->network = number;
  return KIF_STATUS_OK;
}

}  // namespace

KIF_Status ListCounters(const NodeInfo &, const KIF_ParamList *parent, KIF_ParamList *list) {
  KIF_Status status = ReadCounters(Integer(parent, 0));
  if (status != KIF_STATUS_OK) return status;
  for (const Counter &counter : snapshot->all) {
    if (status == KIF_STATUS_OK) status = KIF_ParamListAddString(list, counter.name);
  }
  return status;
}

KIF_Status GetCounter(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  const int64_t network = Integer(instance, 0);
  const char *name = TextAt(instance, 1);
  const KIF_Status status = network == snapshot->network ? KIF_STATUS_OK : ReadCounters(network);
  if (status != KIF_STATUS_OK) return status;
  const Counter *found = std::lower_bound(
      snapshot->all.begin(), snapshot->all.end(), name,
      [](const Counter &counter, const char *wanted) { return strcmp(counter.name, wanted) < 0; });
  const bool isThere = found != snapshot->all.end() && strcmp(found->name, name) == 0;
  if (!isThere) return KIF_STATUS_NOT_FOUND;
  *static_cast<NetworkCounter *>(record) = {1, found->value};
  return KIF_STATUS_OK;
}
