#include "param_list.h"

#include <cstddef>
#include <cstdlib>
#include <cstring>

#include "status.h"
#include "trace.h"

static_assert(offsetof(Param, type) == 0 && sizeof(static_cast<Param *>(nullptr)->type) == 4);

bool ReserveParams(KIF_ParamList *list, uint32_t capacity) {
  if (capacity <= list->capacity) return true;
  void *grown = realloc(list->params, size_t{capacity} * sizeof(Param));
  if (grown == nullptr) return false;
  list->params = static_cast<Param *>(grown);
  list->capacity = capacity;
  return true;
}

namespace {

KIF_Status Append(KIF_ParamList *list, const Param &param) {
  if (list->count == list->capacity) {
    const uint32_t wanted = list->capacity < 4 ? 4 : list->capacity * 2;
    if (wanted <= list->capacity || !ReserveParams(list, wanted)) return KIF_STATUS_NO_MEMORY;
  }
  list->params[list->count++] = param;
  return KIF_STATUS_OK;
}

Param *ParamAt(KIF_ParamList *list, uint32_t index) {
  return list != nullptr && index < list->count ? &list->params[index] : nullptr;
}

}  // namespace

KIF_ParamList *KIF_ParamListCreate(uint32_t kind, uint32_t size) {
  constexpr uint32_t kMostAtCreation = 1024;  // a hint; lists grow as they are filled
  (void)kind;
  auto *list = static_cast<KIF_ParamList *>(calloc(1, sizeof(KIF_ParamList)));
  if (list != nullptr && !ReserveParams(list, size < kMostAtCreation ? size : kMostAtCreation)) {
    free(list);
    list = nullptr;
  }
  TraceCreated(TraceKind::kList, list);
  return list;
}

void KIF_ParamListDestroy(KIF_ParamList *list) {
  if (list == nullptr) return;
  TraceDestroyed(TraceKind::kList, list);
  while (list->count > 0) KIF_ParamListRemoveLastParam(list);
  free(list->params);
  free(list);
}

KIF_Status KIF_ParamListAddInt(KIF_ParamList *list, int64_t value) {
  if (list == nullptr) return KIF_STATUS_BAD_PARAMETER;
  return Append(list, {KIF_PARAM_INTEGER, value, nullptr});
}

KIF_Status KIF_ParamListAddString(KIF_ParamList *list, const char *text) {
  if (list == nullptr) return KIF_STATUS_BAD_PARAMETER;
  char *copy = nullptr;
  if (text != nullptr && (copy = strdup(text)) == nullptr) return KIF_STATUS_NO_MEMORY;
  const KIF_Status status = Append(list, {KIF_PARAM_STRING, 0, copy});
  if (status != KIF_STATUS_OK) free(copy);
  return status;
}

void KIF_ParamListRemoveLastParam(KIF_ParamList *list) {
  if (list == nullptr || list->count == 0) return;
  free(list->params[--list->count].text);
}

int32_t KIF_ParamListUsedCount(KIF_ParamList *list) {
  return static_cast<int32_t>(CountOf(list));
}

KIF_Param *KIF_ParamListGetParam(KIF_ParamList *list, uint32_t index) {
  return reinterpret_cast<KIF_Param *>(ParamAt(list, index));
}

KIF_Status KIF_ParamListGetInt32(KIF_ParamList *list, uint32_t index, int32_t *value) {
  int64_t integer;
  if (value == nullptr || !IntegerAt(list, index, &integer)) return KIF_STATUS_BAD_PARAMETER;
  *value = static_cast<int32_t>(integer);
  return KIF_STATUS_OK;
}

KIF_Status KIF_ParamListGetUInt64(KIF_ParamList *list, uint32_t index, uint64_t *value) {
  int64_t integer;
  if (value == nullptr || !IntegerAt(list, index, &integer)) return KIF_STATUS_BAD_PARAMETER;
  *value = static_cast<uint64_t>(integer);
  return KIF_STATUS_OK;
}

KIF_Status KIF_ParamListGetString(KIF_ParamList *list, uint32_t index, const char **text) {
  const Param *param = ParamAt(list, index);
  if (text == nullptr || param == nullptr || param->type != KIF_PARAM_STRING) {
    return KIF_STATUS_BAD_PARAMETER;
  }
  *text = param->text;
  return KIF_STATUS_OK;
}

int64_t KIF_ParamGetInt(KIF_Param *param) {
  return param != nullptr ? reinterpret_cast<Param *>(param)->integer : 0;
}

const char *KIF_ParamGetString(KIF_Param *param) {
  return param != nullptr ? reinterpret_cast<Param *>(param)->text : nullptr;
}
