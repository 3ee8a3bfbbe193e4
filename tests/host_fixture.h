// Runs the real programs of this build on hosts written in kifcache's text form, or on this
// machine, and gives back what they did.
#pragma once

#include <gtest/gtest.h>

#include <string>
#include <vector>

struct Outcome {
  std::string out;
  std::string err;
  int status = -1;  // exit status; minus the number of the signal that ended the program
};

// What a run gets beside its arguments.
struct Surroundings {
  std::vector<std::string> environment = {};  // "NAME=value", added to the test's own
  std::string directory = {};                 // working directory; empty: the test's scratch folder
  std::vector<std::string> preloaded = {};    // libraries of the test build, see Preload()
};

class HostTest : public testing::Test {
 protected:
  HostTest();
  ~HostTest() override;

  // Builds `hostText` into a cache file in the scratch folder and gives its path. The test fails
  // where kifcache refuses the text.
  std::string Record(const std::string &hostText);

  // Runs any program: its path or name first. A shell finds the folders of the build in the
  // variables BIN_DIR and LIB_DIR.
  Outcome Run(const std::vector<std::string> &commandLine, Surroundings surroundings = {});

  // A path without blanks or colons, which LD_PRELOAD cannot take, of a library of the test build:
  //   FAULT_INJECT   makes calls of the program fail (fault/fault.h)
  //   HWDATA_FOLDER  gives it PCI ID files from the folder that the variable HWDATA_FOLDER names,
  //                  in place of those in /usr/share/hwdata (pci/pci-ids/)
  //   OWN_SIGNALS    lets it signal no process but those of the test (worlds/own_signals.cc)
  //   LSTAT_DEVICE   makes files look like those of the in-memory file system (fsstats/)
  std::string Preload(const std::string &library) { return Link(library); }

  // A link to a file or folder, by a path without blanks, colons or other signs.
  std::string Link(const std::string &path);

  // A folder with copies of the programs that every user may run, wherever the checkout lies.
  std::string ProgramsForAnyone();

  // Writes a file below the scratch folder, with the folders it needs, and gives its path.
  std::string WriteFile(const std::string &path, const std::string &bytes);
  static std::string ReadFile(const std::string &path);
  const std::string &Scratch() const { return scratch_; }

 private:
  std::string scratch_;
  int recorded_ = 0;
};
