#include "refusals.h"

#include "status.h"

namespace {

bool IsRefusal(KIF_Status status) {
  return status != KIF_STATUS_OK && status != KIF_STATUS_NOT_FOUND &&
         status != KIF_STATUS_NOT_SUPPORTED && status != KIF_STATUS_NO_COMMAND_LINE;
}

// The parameters whose names are not those of what they select.
struct Noun {
  std::string_view parameter;
  const char *plural;
};
constexpr Noun kNouns[] = {
    {"acpiTable", "ACPI tables"},
    {"address", "mappings"},
    {"bootFile", "boot option files"},
    {"bus", "buses"},
    {"child", "children"},
    {"pcpu", "CPUs"},
};

std::string Plural(const ParameterInfo &parameter) {
  for (const Noun &noun : kNouns) {
    if (noun.parameter == parameter.name) return noun.plural;
  }
  return std::string(parameter.name) + "s";
}

// "descriptors of" for the lists of a node, "cmdline of" for the records that another node lists.
std::string PartOf(const VisitedNode &node, Refusals::Kind kind, size_t parameters) {
  const Description &description = *node.description;
  if (kind == Refusals::kList) return Plural(description.parameters[parameters]) + " of ";
  if (description.hasLists) return "";
  const std::string_view path = node.path;
  return std::string(path.substr(path.rfind('_') + 1)) + " of ";
}

const char *ReasonFor(KIF_Status status) {
  return status == KIF_STATUS_NO_PERMISSION ? "not permitted" : ZLK_ReturnStatusToString(status);
}

}  // namespace

Refusals::Answers *Refusals::Find(const VisitedNode &node, Kind kind) {
  if (node.path == lastPath_ && kind == lastKind_) return last_;
  lastPath_ = node.path;
  lastKind_ = kind;
  last_ = &answers_[{node.path, kind}];
  const Description *description = node.description;
  size_t parameters = description != nullptr ? description->parameterCount : 0;
  if (kind == kList && parameters > 0) --parameters;
  last_->group = description != nullptr ? description->group : "other";
  if (parameters > 0) {
    last_->what = PartOf(node, kind, parameters);
    last_->whole = Plural(description->parameters[parameters - 1]);
  } else {
    last_->what = node.path;
  }
  return last_;
}

void Refusals::Count(const VisitedNode &node, Kind kind, KIF_Status status) {
  Answers *answers = Find(node, kind);
  ++answers->count;
  if (!IsRefusal(status)) return;
  ++answers->refused[status];
  ++groups_[answers->group];
}

std::vector<std::string> Refusals::Sentences() const {
  std::vector<std::string> sentences;
  for (const auto &[place, answers] : answers_) {
    for (const auto &[status, count] : answers.refused) {
      std::string sentence = answers.group + ": " + answers.what;
      if (!answers.whole.empty()) {
        sentence += std::to_string(count) + " of " + std::to_string(answers.count) + " ";
      }
      sentences.push_back(sentence + answers.whole + " could not be read: " + ReasonFor(status));
    }
  }
  return sentences;
}

bool Refusals::HasForbidden() const {
  for (const auto &[place, answers] : answers_) {
    if (answers.refused.contains(KIF_STATUS_NO_PERMISSION)) return true;
  }
  return false;
}
