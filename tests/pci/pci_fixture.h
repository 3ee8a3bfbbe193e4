// Runs the PCI tools with PCI ID files of the test's own, mounted over those of the machine in a
// mount namespace that lives as long as the run.
#pragma once

#include <unistd.h>

#include <map>
#include <string>
#include <vector>

#include "host_fixture.h"

// Paths below the folder of the PCI ID files, and what is in the files.
using IdsFiles = std::map<std::string, std::string>;

class PciTest : public HostTest {
 protected:
  // Whether this user can mount a folder over that of the PCI ID files.
  bool CanMount() {
    WriteIds({});
    return Mounted({"true"}).status == 0;
  }

  // A cache run of `arguments` on the host, with these and no other PCI ID files. `prefix` is a
  // shell command to run first.
  Outcome WithIds(const IdsFiles &files, const std::string &hostText,
                  const std::vector<std::string> &arguments, const std::string &prefix = ":") {
    WriteIds(files);
    std::vector<std::string> commandLine = {BIN_DIR "/zlkkiftools", "-c", Record(hostText)};
    commandLine.insert(commandLine.end(), arguments.begin(), arguments.end());
    return Mounted(commandLine, prefix);
  }

 private:
  std::string Folder() const { return Scratch() + "/hwdata" + std::to_string(folders_); }

  void WriteIds(const IdsFiles &files) {
    ++folders_;
    WriteFile("hwdata" + std::to_string(folders_) + "/README", "");
    for (const auto &[path, bytes] : files) {
      WriteFile("hwdata" + std::to_string(folders_) + "/" + path, bytes);
    }
  }

  Outcome Mounted(const std::vector<std::string> &commandLine, const std::string &prefix = ":") {
    const std::string script =
        "mount --bind " + Folder() + " /usr/share/hwdata && " + prefix + " && exec \"$@\"";
    std::vector<std::string> mounted = {
        "unshare", geteuid() == 0 ? "-m" : "-rm", "sh", "-c", script, "sh"};
    mounted.insert(mounted.end(), commandLine.begin(), commandLine.end());
    return Run(mounted);
  }

  int folders_ = 0;
};
