#include "data.h"

#include <cstddef>
#include <cstdlib>
#include <cstring>

#include "trace.h"

static_assert(offsetof(Data, length) == 0);

KIFData *KIFData_Create(uint32_t capacity, const void *bytes, uint32_t length) {
  Data *data = nullptr;
  const uint64_t size = sizeof(Data) + uint64_t{capacity};
  if (length <= capacity && size <= PTRDIFF_MAX) {
    data = static_cast<Data *>(malloc(static_cast<size_t>(size)));
  }
  if (data != nullptr) {
    data->length = bytes != nullptr ? length : 0;
    data->capacity = capacity;
    if (data->length > 0) memcpy(data->bytes, bytes, data->length);
  }
  TraceCreated(TraceKind::kData, data);
  return reinterpret_cast<KIFData *>(data);
}

void *KIFData_GetData(KIFData *data) {
  return data != nullptr ? DataOf(data)->bytes : nullptr;
}

void KIFData_Destroy(KIFData *data) {
  if (data == nullptr) return;
  TraceDestroyed(TraceKind::kData, data);
  free(data);
}
