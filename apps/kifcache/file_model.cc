#include "file_model.h"

#include <cstring>

#include "messages.h"
#include "visit.h"

namespace {

const NodeField *FindField(const NodeField *fields, size_t count, const char *name) {
  for (const NodeField *field = fields; field < fields + count; ++field) {
    if (strcmp(field->name, name) == 0) return field;
  }
  return nullptr;
}

class Reader : public Visitor {
 public:
  explicit Reader(HostModel *model) : model_(model) {}

  void OnHost(const Facts &facts) override {
    model_->facts = facts;
    // The nodes get this catalogue's descriptions.
    model_->facts.minorVersion = kCacheMinorVersion;
    model_->facts.catalogue = CatalogueHash();
  }
  void OnNode(const VisitedNode &node) override {
    known_ = FindNodeByPath(node.path, strlen(node.path));
    of_ = known_ != nullptr ? model_->NodeOf(node.path) : nullptr;
    unshared_.clear();
    if (known_ != nullptr) NoteUnshared(*node.description);
  }
  void OnList(const VisitedNode &, const Values &parent, KIF_Status status,
              const Values &entries) override {
    if (of_ != nullptr) model_->AddList(of_, parent, status, entries);
  }
  void OnRecord(const VisitedNode &, const Values &instance, KIF_Status status,
                std::string_view record) override {
    if (of_ == nullptr) return;
    std::string kept(record);
    kept.resize(known_->recordSize);
    for (const NodeField *field : unshared_) {
      if (field->offset >= kept.size()) continue;
      const size_t size = std::min<size_t>(field->size, kept.size() - field->offset);
      kept.replace(field->offset, size, size, '\0');
    }
    model_->AddRecord(of_, instance, status, kept);
  }
  void OnContent(const VisitedNode &, const Values &instance, const cache::Stored &answer,
                 std::string_view bytes) override {
    const ContentAnswer content = {answer.length_status(), answer.read_status(), answer.total(),
                                   std::string(bytes)};
    if (of_ != nullptr) model_->AddContent(of_, instance, content);
  }
  void OnSet(const VisitedNode &, KIF_Status status) override {
    if (of_ != nullptr) of_->setStatus = status;
  }

 private:
  // Fields that the file or the catalogue alone names: neither can be told by the other's.
  void NoteUnshared(const Description &description) {
    description_ = description;
    const NodeField *ours = FieldsOf(*known_);
    for (size_t i = 0; i < description_.fieldCount; ++i) {
      const NodeField *field = &description_.fields[i];
      if (FindField(ours, known_->fieldCount, field->name) == nullptr) unshared_.push_back(field);
    }
    for (const NodeField *field = ours; field < ours + known_->fieldCount; ++field) {
      if (FindField(description_.fields, description_.fieldCount, field->name) == nullptr) {
        unshared_.push_back(field);
      }
    }
  }

  HostModel *model_;
  const NodeInfo *known_ = nullptr;
  NodeModel *of_ = nullptr;
  Description description_ = {};
  std::vector<const NodeField *> unshared_;
};

}  // namespace

bool ReadKnown(const char *name, const CacheFile &file, HostModel *model) {
  if (!FitsCatalogue(file, nullptr, nullptr)) {
    return Complain(name, "another interface's: kifcache check tells where it differs");
  }
  Reader reader(model);
  std::string problem;
  return VisitAll(file, &reader, &problem) || Complain(name, "damaged: what it has of " + problem);
}
