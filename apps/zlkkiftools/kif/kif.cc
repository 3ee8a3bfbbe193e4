#include "kif/kif.h"

#include <stdio.h>

#include "kiftools.h"
#include "output.h"

bool HostIsElsewhere() {
  return InvokedWithCache != 0 || (KIF_HostIsForeign != nullptr && KIF_HostIsForeign());
}

KIF_Status GetInstanceList(KIF_NodeId node, KIF_ParamList *parent, ParamListHandle *list) {
  KIF_ParamList *fetched = nullptr;
  const KIF_Status status = KIF_GetInstanceListAlloc(node, parent, &fetched);
  if (status == 0) list->reset(fetched);
  return status;
}

namespace {

// The library gives no parameter when it has none to give; the copy has then failed.
KIF_Status AppendCopy(KIF_Param *param, KIF_ParamList *list) {
  if (param == nullptr) return KIF_STATUS_FAILURE;
  switch (param->type) {
    case KIF_PARAM_INTEGER:
      return KIF_ParamListAddInt(list, KIF_ParamGetInt(param));
    case KIF_PARAM_STRING:
      return KIF_ParamListAddString(list, KIF_ParamGetString(param));
    default:
      Panic("NOT_IMPLEMENTED %s:%d\n", "apps/zlkkiftools/kiftools", 178);
  }
}

}  // namespace

bool CopyParamToList(KIF_Param *param, KIF_ParamList *list) {
  const KIF_Status status = AppendCopy(param, list);
  if (status != 0) fprintf(Messages(), "Couldn't add param to list: %#x", status);
  return status == 0;
}

bool InstanceWalk::Next() {
  TakeOff();
  if (failed_ || next_ >= count_) return false;
  param_ = KIF_ParamListGetParam(instances_, static_cast<uint32_t>(next_));
  ++next_;
  appended_ = CopyParamToList(param_, selector_);
  failed_ = !appended_;
  return appended_;
}

KIF_Status InstanceWalk::Replace(int64_t value) {
  TakeOff();
  const KIF_Status status = KIF_ParamListAddInt(selector_, value);
  appended_ = status == 0;
  return status;
}

void InstanceWalk::TakeOff() {
  if (appended_) KIF_ParamListRemoveLastParam(selector_);
  appended_ = false;
}
