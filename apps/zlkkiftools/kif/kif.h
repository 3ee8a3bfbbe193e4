// The program's use of the platform library: the statuses that it names, owning handles, the two
// shared wrappers, the walk over an instance list, and reads of fixed records.
#pragma once

#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <memory>
#include <type_traits>

#include "zellibs.h"

// Statuses that the program names itself.
#define KIF_STATUS_FAILURE 0xbad0001u
#define KIF_STATUS_BAD_PARAMETER 0xbad0007u
#define KIF_STATUS_NO_PERMISSION 0xbad000fu
#define KIF_STATUS_NO_MEMORY 0xbad0014u
#define KIF_STATUS_NO_RESOURCES 0xbad0017u
#define KIF_STATUS_NO_COMMAND_LINE 0xbad0062u

static_assert(std::endian::native == std::endian::little, "records are little-endian");

struct ParamListDeleter {
  void operator()(KIF_ParamList *list) const { KIF_ParamListDestroy(list); }
};
using ParamListHandle = std::unique_ptr<KIF_ParamList, ParamListDeleter>;

struct DataDeleter {
  void operator()(KIFData *data) const { KIFData_Destroy(data); }
};
using DataHandle = std::unique_ptr<KIFData, DataDeleter>;

// Libraries that know no other machine do not have it.
#pragma weak KIF_HostIsForeign

// Whether the processes and files of this machine are not the host's: on a cache run, and where the
// library serves another machine live.
bool HostIsElsewhere();

// A new, empty list that selects an instance; null without memory.
inline ParamListHandle CreateInstance() {
  return ParamListHandle(KIF_ParamListCreate(KIF_PARAMLIST_INSTANCE, 1));
}

// Fetches the instances of `node` below `parent` (null: none) into `*list`, which stays as it was
// when the status is not 0.
KIF_Status GetInstanceList(KIF_NodeId node, KIF_ParamList *parent, ParamListHandle *list);

// Appends a copy of `param` to `list`. On failure writes its message, without a line break, to
// standard error and gives false; ends the process when `param` has an unknown type.
bool CopyParamToList(KIF_Param *param, KIF_ParamList *list);

// Reads the record of `node` for `instance` (null: none). Record is the whole wire record.
template <typename Record>
KIF_Status ReadRecord(KIF_NodeId node, KIF_ParamList *instance, Record *record) {
  static_assert(std::is_trivially_copyable_v<Record> && alignof(Record) == 1,
                "a wire record is packed");
  return KIF_Get(node, instance, record, sizeof(Record));
}

// The same for the instance that has the text `name` for its one parameter.
template <typename Record>
KIF_Status ReadRecordOf(KIF_NodeId node, const char *name, Record *record) {
  const ParamListHandle instance = CreateInstance();
  if (instance == nullptr) return KIF_STATUS_NO_MEMORY;
  const KIF_Status status = KIF_ParamListAddString(instance.get(), name);
  return status != 0 ? status : ReadRecord(node, instance.get(), record);
}

// Ends the text in a record's field at the field's last byte at the latest, and gives it.
template <size_t Size>
char *FieldText(char (&field)[Size]) {
  field[Size - 1] = '\0';
  return field;
}

// Appends one integer to a list for as long as it lives.
class AppendedInt {
 public:
  AppendedInt(KIF_ParamList *list, int64_t value)
      : list_(list), status_(KIF_ParamListAddInt(list, value)) {}
  ~AppendedInt() {
    if (status_ == 0) KIF_ParamListRemoveLastParam(list_);
  }
  AppendedInt(const AppendedInt &) = delete;
  AppendedInt &operator=(const AppendedInt &) = delete;

  KIF_Status status() const { return status_; }

 private:
  KIF_ParamList *list_;
  KIF_Status status_;
};

// A walk over the entries of an instance list. Each step takes the parameter of the step before
// off the selecting list and appends a copy of the next entry; the step that finds no entry leaves
// the list as it was before the walk. A walk left earlier leaves its entry on the list, which is
// then of no more use. Both lists must outlive the walk.
class InstanceWalk {
 public:
  InstanceWalk(KIF_ParamList *instances, KIF_ParamList *selector)
      : instances_(instances), selector_(selector), count_(KIF_ParamListUsedCount(instances)) {}
  InstanceWalk(const InstanceWalk &) = delete;
  InstanceWalk &operator=(const InstanceWalk &) = delete;

  // Goes to the next entry. False after the last one, and when the entry cannot be appended
  // (CopyParamToList has said so); failed() tells the two apart.
  bool Next();
  bool failed() const { return failed_; }

  // Puts `value` in the place of the current entry on the selecting list, for the reads up to the
  // next step.
  KIF_Status Replace(int64_t value);

  // Takes the current entry off the selecting list already, not only at the next step.
  void TakeOff();

  // Number of entries to walk over.
  uint32_t count() const { return count_ > 0 ? static_cast<uint32_t>(count_) : 0; }

  KIF_ParamList *selector() const { return selector_; }

  // The current entry and its place in the list, from 0.
  KIF_Param *param() const { return param_; }
  uint32_t index() const { return static_cast<uint32_t>(next_ - 1); }

 private:
  KIF_ParamList *instances_;
  KIF_ParamList *selector_;
  int32_t count_;
  int32_t next_ = 0;
  KIF_Param *param_ = nullptr;
  bool appended_ = false;
  bool failed_ = false;
};
