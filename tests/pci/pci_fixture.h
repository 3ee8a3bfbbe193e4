// Runs the PCI tools with PCI ID files of the test's own in place of those of the machine.
#pragma once

#include <map>
#include <string>
#include <vector>

#include "host_fixture.h"

// Paths below the folder of the PCI ID files, and what is in the files.
using IdsFiles = std::map<std::string, std::string>;

class PciTest : public HostTest {
 protected:
  // A cache run of `arguments` on the host, with these and no other PCI ID files. `prefix` is a
  // shell command to run first.
  Outcome WithIds(const IdsFiles &files, const std::string &hostText,
                  const std::vector<std::string> &arguments, const std::string &prefix = ":") {
    const std::string folder = "hwdata" + std::to_string(++folders_);
    for (const auto &[path, bytes] : files) WriteFile(folder + "/" + path, bytes);
    std::vector<std::string> commandLine = {"sh",
                                            "-c",
                                            prefix + " && exec \"$@\"",
                                            "sh",
                                            BIN_DIR "/zlkkiftools",
                                            "-c",
                                            Record(hostText)};
    commandLine.insert(commandLine.end(), arguments.begin(), arguments.end());
    return Run(commandLine, {.environment = {"HWDATA_FOLDER=" + Scratch() + "/" + folder},
                             .preloaded = {HWDATA_FOLDER}});
  }

 private:
  int folders_ = 0;
};
