// What stands in a redacted recording in the place of private texts.
#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <string_view>

#include "marks.h"

constexpr char kEllipsis[] = "…";

class RedactedTexts {
 public:
  // `isAgain`: the recording is redacted, and the numbered names in it stay. All of its texts are
  // then asked for once before the first one is replaced.
  RedactedTexts(bool isAgain, std::string release)
      : isAgain_(isAgain), isNoting_(isAgain), release_(std::move(release)) {}
  void EndNoting() { isNoting_ = false; }

  // In the place of a text of a record. `program` is the name of the world that a command line is
  // of. A text that is cut has the name of the longer one that begins so, if there is one.
  std::string OfText(std::string_view text, Privacy privacy, std::string_view program, bool isCut);

  // In the place of a parameter: unlike texts give unlike ones.
  std::string OfParameter(std::string_view text, Privacy privacy);

 private:
  std::string NameOf(std::string_view text, Privacy kind, bool isCut = false);
  std::string NewName(std::string_view text, Privacy kind);
  std::string OfPath(std::string_view text, Privacy kind, bool isCut);
  std::string OfSocket(std::string_view text);
  std::string OfUnixSocket(std::string_view text);
  std::string OfConnection(std::string_view text);
  std::string OfEndpoint(std::string_view text);
  std::string OfBootCommandLine(std::string_view text) const;
  std::string OfKernel(std::string_view file) const;

  const bool isAgain_;
  bool isNoting_;
  const std::string release_;  // of the host's kernel
  std::map<std::string, std::string, std::less<>> names_;
  std::map<Privacy, uint64_t> numbers_;  // the last one of each kind
};
