#include <gtest/gtest.h>

#include "transcript.h"

int main(int count, char **arguments) {
  testing::InitGoogleTest(&count, arguments);
  RegisterTranscripts(TRANSCRIPTS);
  return RUN_ALL_TESTS();
}
