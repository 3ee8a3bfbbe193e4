// Tests written as transcripts of a terminal; README.md beside this file says how one is written.
#pragma once

#include <string>

// Makes a test of every case in the files FOLDER/*.transcript. RENEW=1 in the environment: the
// files get what the commands say now, and the difference is shown.
void RegisterTranscripts(const std::string &folder);
