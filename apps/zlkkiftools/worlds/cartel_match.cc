#include "worlds/cartel_match.h"

#include "records/worlds.h"
#include "worlds/command_line.h"

PatternHandle CompilePattern(const char *text, char (&error)[kPatternErrorSize]) {
  error[0] = '\0';
  PatternHandle pattern(static_cast<Pattern *>(calloc(1, sizeof(Pattern))));
  if (pattern == nullptr) return nullptr;
  const int code = regcomp(&pattern->expression, text, REG_EXTENDED | REG_NOSUB);
  if (code != 0) {
    regerror(code, &pattern->expression, error, sizeof(error));
    return nullptr;
  }
  pattern->compiled = true;
  return pattern;
}

KIF_Status MatchCartels(const Pattern &pattern, bool wholeLine, CartelVisitor visit,
                        void *context) {
  const ParamListHandle selector = CreateInstance();
  if (selector == nullptr) return KIF_STATUS_NO_MEMORY;
  ParamListHandle cartels;
  KIF_Status status = GetInstanceList(KIF_NODE_userworld_cartel, nullptr, &cartels);
  if (status != 0) return status;

  InstanceWalk walk(cartels.get(), selector.get());
  while (walk.Next()) {
    CartelCommandLine commandLine = {};
    status = ReadRecord(KIF_NODE_userworld_cartel_cmdline, selector.get(), &commandLine);
    if (status == KIF_STATUS_NO_COMMAND_LINE) continue;
    if (status != 0) return status;
    char *text = FieldText(commandLine.cmdline);
    if (!wholeLine) CutAtBlank(text);
    const bool matches = regexec(&pattern.expression, text, 0, nullptr, 0) == 0;
    status = visit({text, matches, cartels.get(), walk.index()}, context);
    if (status != 0) return status;
  }
  return walk.failed() ? KIF_STATUS_FAILURE : 0;
}
