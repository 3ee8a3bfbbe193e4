// Parameter lists, from the inside.
#pragma once

#include <cstdint>

#include "zellibs.h"

// A parameter, beginning as callers see it. Strings are the list's own copies.
struct Param {
  uint32_t type;  // KIF_PARAM_INTEGER or KIF_PARAM_STRING
  int64_t integer;
  char *text;  // may be null
};

struct KIF_ParamList {
  uint32_t count;
  uint32_t capacity;
  Param *params;
};

// Number of parameters of a list that may be null.
inline uint32_t CountOf(const KIF_ParamList *list) {
  return list != nullptr ? list->count : 0;
}

// Makes room for `capacity` parameters, so that the appends up to there do not allocate. False
// without memory.
bool ReserveParams(KIF_ParamList *list, uint32_t capacity);

// The integer at `index`; false where there is none.
inline bool IntegerAt(const KIF_ParamList *list, uint32_t index, int64_t *value) {
  if (index >= CountOf(list) || list->params[index].type != KIF_PARAM_INTEGER) return false;
  *value = list->params[index].integer;
  return true;
}

// The text at `index`, or null where there is none or it has no value.
inline const char *TextAt(const KIF_ParamList *list, uint32_t index) {
  if (index >= CountOf(list) || list->params[index].type != KIF_PARAM_STRING) return nullptr;
  return list->params[index].text;
}
