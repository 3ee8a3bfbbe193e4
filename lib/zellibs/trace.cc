#include "trace.h"

#include <fcntl.h>
#include <stdarg.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "base/utf8.h"
#include "param_list.h"
#include "status.h"

namespace {

enum class Tracing : uint8_t { kUnknown, kOff, kOn };

Tracing tracing = Tracing::kUnknown;
int descriptor = -1;

// The objects that live: made and not destroyed. A trace is for looking at one tool, whose objects
// are few; past this many they are counted but not named.
constexpr size_t kMostLive = 4096;
struct LiveObject {
  TraceKind kind;
  const void *address;
};
LiveObject *live;  // made when tracing begins
size_t liveCount;

// A line under way; what does not fit is cut.
class Line {
 public:
  void Add(const char *format, ...) __attribute__((format(printf, 2, 3))) {
    va_list arguments;
    va_start(arguments, format);
    const int wanted = vsnprintf(text_ + length_, kRoom - length_, format, arguments);
    va_end(arguments);
    if (wanted > 0) length_ += static_cast<size_t>(wanted);
    if (length_ > kRoom - 1) length_ = kRoom - 1;
  }

  // One write a line, so that the lines of several processes do not mix; and a text with a line
  // break in it makes no line of its own.
  void Write() {
    MaskControls(text_, length_);
    text_[length_] = '\n';
    if (write(descriptor, text_, length_ + 1) < 0) tracing = Tracing::kOff;
  }

 private:
  static constexpr size_t kRoom = 4096;
  char text_[kRoom + 1];
  size_t length_ = 0;
};

const char *KindName(TraceKind kind) {
  return kind == TraceKind::kList ? "list" : "data";
}

void ReportLive() {
  for (size_t i = 0; i < liveCount; ++i) {
    Line line;
    line.Add("never destroyed: %s %zu", KindName(live[i].kind), i + 1);
    line.Write();
  }
}

bool IsOn() {
  if (tracing == Tracing::kUnknown) {
    const char *path = secure_getenv("ZELLIBS_TRACE");
    tracing = Tracing::kOff;
    if (path != nullptr && path[0] != '\0') {
      descriptor = open(path, O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, 0600);
      live = static_cast<LiveObject *>(calloc(kMostLive, sizeof(LiveObject)));
      if (descriptor >= 0 && live != nullptr && atexit(ReportLive) == 0) tracing = Tracing::kOn;
    }
  }
  return tracing == Tracing::kOn;
}

void AddParams(Line *line, const KIF_ParamList *list) {
  line->Add("(");
  for (uint32_t i = 0; i < CountOf(list); ++i) {
    const Param &param = list->params[i];
    if (i > 0) line->Add(", ");
    if (param.type == KIF_PARAM_INTEGER) {
      line->Add("%lld", static_cast<long long>(param.integer));
    } else if (param.text == nullptr) {
      line->Add("null");
    } else {
      line->Add("\"%s\"", param.text);
    }
  }
  line->Add(")");
}

}  // namespace

void TraceOperation(const char *operation, uint32_t node, const KIF_ParamList *instance,
                    const KIF_ParamList *input, KIF_Status status) {
  if (!IsOn()) return;
  const NodeInfo *info = FindNode(node);
  Line line;
  line.Add("%s %s", operation, info != nullptr ? info->path : "?");
  AddParams(&line, instance);
  if (input != nullptr) {
    line.Add(" input");
    AddParams(&line, input);
  }
  line.Add(" = 0x%x", status);
  line.Write();
}

void TraceCall(const char *operation, const char *argument, uint32_t result) {
  if (!IsOn()) return;
  Line line;
  line.Add("%s(%s) = 0x%x", operation, argument != nullptr ? argument : "", result);
  line.Write();
}

void TraceCreated(TraceKind kind, const void *object) {
  if (!IsOn() || object == nullptr || liveCount == kMostLive) return;
  live[liveCount++] = {kind, object};
}

void TraceDestroyed(TraceKind, const void *object) {
  if (!IsOn()) return;
  for (size_t i = liveCount; i > 0; --i) {
    if (live[i - 1].address != object) continue;
    memmove(&live[i - 1], &live[i], (liveCount - i) * sizeof(live[0]));
    --liveCount;
    return;
  }
}
