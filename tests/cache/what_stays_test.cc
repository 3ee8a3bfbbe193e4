// The page on kifcache against the marks of the catalogue.
#include <algorithm>

#include "host_fixture.h"
#include "marks.h"

namespace {

const MarkedParameter kNoParameters[kMostParameters] = {};

bool Stays(const MarkRule<Privacy> &privacy) {
  return privacy.Of({kNoParameters, {}}) == Privacy::kPublic;
}

class WhatStays : public HostTest {};

TEST_F(WhatStays, IsListedWithEveryTextOfTheCatalogue) {
  const std::string page = ReadFile(SOURCE_DIR "/man/kifcache.1");
  for (const NodeInfo &node : kNodes) {
    const size_t item = page.find(std::string(".It Li ") + node.path + "\n");
    std::string listed = page.substr(std::min(item, page.size()));
    listed = listed.substr(0, listed.find("\n.")) + "\n";
    const auto expect = [&](const std::string &name, bool stays) {
      const bool isListed = listed.find("\n" + name + "\n") != listed.npos ||
                            listed.find("\n" + name + ",\n") != listed.npos;
      EXPECT_EQ(isListed, stays) << node.path << ": " << name;
    };
    const bool isWithheld = MarksOfOtherBytes(node).privacy.mark == Privacy::kWithheld;
    for (size_t i = 0; i < node.fieldCount; ++i) {
      const NodeField &field = FieldsOf(node)[i];
      const bool isText = field.type == FieldType::kText;
      if (isText) expect(field.name, !isWithheld && Stays(MarksOfField(node, i).privacy));
    }
    for (size_t i = 0; i < node.parameterCount; ++i) {
      const ParameterInfo &parameter = ParameterOf(node, i);
      if (parameter.type == kText) expect(parameter.name, Stays(MarksOfParameter(node, i).privacy));
    }
    if (node.hasContents) expect("content", Stays(MarksOfContent(node).privacy));
  }
}

}  // namespace
