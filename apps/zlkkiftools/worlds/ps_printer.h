// Draws the output of ps on standard output. The widths follow maxWorldID and maxNameLength, which
// do not change any more when a printer is made.
#pragma once

#include <stddef.h>

#include "base/bytes.h"
#include "worlds/ps_options.h"
#include "worlds/world_record.h"

struct PsColumn;
constexpr size_t kPsColumns = 15;  // rows of the table of columns

// The display option of the columns that an option letter shows; 0 where it shows none.
PsOptions PsColumnOption(int letter);

class PsPrinter {
 public:
  // `texts` are those of the records printed, and outlive the printer.
  PsPrinter(PsOptions options, const WorldTexts &texts);

  // Makes room for the branches of the deepest tree that the linked inventory can have; to be
  // called before a tree is printed. False, after a message, without memory.
  bool ReserveBranches(const WorldInventory &inventory);

  // One line of column titles.
  void PrintHeader() const;

  // One line for one record.
  void PrintRow(const WorldRecord &record) const;

  // A userspace's number, its root and everything linked below it. A root hangs under nothing.
  // Raises deepestLevel.
  void PrintTree(const WorldRecord &root);

 private:
  void PrintCell(const PsColumn &column, const WorldRecord &record) const;
  void PrintType(uint32_t worldType) const;
  void PrintState(const WorldRecord &record) const;
  void PushBranch(const WorldRecord &record);
  void PopBranch(const WorldRecord &record);

  bool Has(PsOptions option) const { return (options_ & option) != 0; }

  PsOptions options_;
  const WorldTexts &texts_;
  int idWidth_;
  int nameWidth_;
  uint32_t runStates_;
  uint32_t waitStates_;
  const PsColumn *shown_[kPsColumns];  // in their order
  size_t shownCount_ = 0;

  // What a row of the tree begins with: a branch for every level above it.
  Bytes branches_;
};
