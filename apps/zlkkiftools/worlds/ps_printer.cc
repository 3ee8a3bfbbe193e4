#include "worlds/ps_printer.h"

#include <stdio.h>
#include <string.h>

#include <string_view>

#include "output.h"
#include "records/worlds.h"
#include "zellibs.h"

namespace {

// Characters of the DEC Special Graphics set, between shift out and shift in.
#define LINE_DRAWING(character) "\016" character "\017"
constexpr char kVerticalLine[] = LINE_DRAWING("x") " ";
constexpr char kNoLine[] = "  ";
constexpr char kBranch[] = LINE_DRAWING("t") LINE_DRAWING("q");
constexpr char kCorner[] = LINE_DRAWING("m") LINE_DRAWING("q");
#undef LINE_DRAWING

// What a width is counted from: nothing, the longest ID or the longest name.
enum class Base : uint8_t { kNone, kIds, kNames };

enum class Cell : uint8_t {
  kWorldId,
  kCartelId,
  kName,
  kChildren,
  kThreads,
  kGroup,
  kProcessGroup,
  kSession,
  kParent,
  kType,
  kState,
  kTime,
  kSecurityDomain,
  kUserspace,
  kCommand,
};

}  // namespace

// Without pointers, so that a start has nothing of it to relocate.
struct PsColumn {
  char letter;       // of the option that shows it; 0: it is always shown
  PsOptions option;  // its bit
  bool ofZombies;    // zombies have something in it, be it blanks
  Base base;
  int8_t headerFill;  // blanks behind the title, added to the base
  int8_t width;       // of an ID's cell, added to the base
  Cell cell;          // how it prints
  char header[24];
};

namespace {

constexpr PsColumn kColumns[] = {
    {0, 0, true, Base::kIds, -3, 0, Cell::kWorldId, "WID"},
    {0, 0, true, Base::kIds, -3, 0, Cell::kCartelId, "  CID"},
    {0, 0, true, Base::kNames, -9, 0, Cell::kName, "  WorldName"},
    {'n', PS_NCHILDREN, false, Base::kNone, 0, 0, Cell::kChildren, "  nChildren"},
    {'N', PS_NTHREADS, false, Base::kNone, 0, 0, Cell::kThreads, "  nThreads"},
    {'j', PS_GID, false, Base::kIds, -4, 0, Cell::kGroup, "  GID"},
    {'g', PS_PGID_SID, true, Base::kIds, -5, -2, Cell::kProcessGroup, "  PGID"},
    {'g', PS_PGID_SID, true, Base::kIds, -4, -2, Cell::kSession, "  SID"},
    {'P', PS_PCID, true, Base::kIds, -4, 2, Cell::kParent, "  PCID"},
    {'t', PS_TYPE, false, Base::kNone, 0, 0, Cell::kType, "  Type  "},
    {'s', PS_STATE, true, Base::kNone, 0, 0, Cell::kState, "  State   Wait    CPU "},
    {'T', PS_TIME, false, Base::kNone, 8, 0, Cell::kTime, "  Time"},
    {'Z', PS_SECURITY_DOMAIN, false, Base::kNone, 0, 0, Cell::kSecurityDomain, "  SecurityDomain"},
    {'U', PS_USERSPACE, false, Base::kNone, 0, 0, Cell::kUserspace, "  UserSpace"},
    {'c', PS_COMMAND, false, Base::kNone, 0, 0, Cell::kCommand, "  Command"},
};
static_assert(sizeof(kColumns) / sizeof(kColumns[0]) == kPsColumns);

// The state columns of a world without scheduler data.
constexpr int kBlankState = 18;

struct WorldKind {
  uint32_t bit;
  const char *name;
  char letter;
};

constexpr WorldKind kWorldKinds[] = {
    {kWorldTypeSystem, "System", 'S'}, {kWorldTypeIdle, "Idle", 'I'},
    {kWorldTypeUser, "User", 'U'},     {kWorldTypeVmm, "VMM", 'V'},
    {kWorldTypeHelper, "Helper", 'H'}, {kWorldTypeClone, "Clone", 'X'},
    {kWorldTypeTest, "Test", 'T'},     {kWorldTypeAssistant, "Assistant", 'A'},
};

const WorldKind *FindKind(uint32_t bit) {
  for (const WorldKind &kind : kWorldKinds) {
    if (kind.bit == bit) return &kind;
  }
  return nullptr;
}

uint32_t CountStates(const CpuSched_StateElement *elements) {
  uint32_t count = 0;
  while (elements[count].name != nullptr) ++count;
  return count;
}

std::string_view BranchBelow(const WorldRecord &record) {
  return record.nextSibling != nullptr ? kVerticalLine : kNoLine;
}

void Fill(int count) {
  for (; count > 0; --count) putchar_unlocked(' ');
}

// A number in its column: two blanks, the number, and blanks up to `width` characters.
void PrintNumber(int32_t number, int width) {
  Fill(width - printf("  %d", number));
}

// The same for what a kernel world has none of.
void PrintNumber(bool has, int32_t number, int width) {
  if (has) {
    PrintNumber(number, width);
  } else {
    fputs("  0", stdout);
    Fill(width - 1);
  }
}

}  // namespace

PsOptions PsColumnOption(int letter) {
  for (const PsColumn &column : kColumns) {
    if (column.letter != 0 && column.letter == letter) return column.option;
  }
  return 0;
}

PsPrinter::PsPrinter(PsOptions options, const WorldTexts &texts)
    : options_(options),
      texts_(texts),
      idWidth_(snprintf(nullptr, 0, "%d", static_cast<int32_t>(maxWorldID))),
      nameWidth_(static_cast<int>(maxNameLength)),
      runStates_(CountStates(CpuSched_RunStateElements)),
      waitStates_(CountStates(CpuSched_WaitStateElements)) {
  for (const PsColumn &column : kColumns) {
    if (column.letter == 0 || Has(column.option)) shown_[shownCount_++] = &column;
  }
}

void PsPrinter::PrintHeader() const {
  if (Has(PS_TREE)) fputs("  ", stdout);
  for (size_t i = 0; i < shownCount_; ++i) {
    const PsColumn &column = *shown_[i];
    const int base = column.base == Base::kIds     ? idWidth_
                     : column.base == Base::kNames ? nameWidth_
                                                   : 0;
    fputs(column.header, stdout);
    Fill(base + column.headerFill);
  }
  putchar('\n');
}

inline void PsPrinter::PrintCell(const PsColumn &column, const WorldRecord &record) const {
  const int idWidth = idWidth_ + column.width;
  const bool isUser = record.cartelID != 0;
  switch (column.cell) {
    case Cell::kWorldId:
      return Fill(idWidth - printf("%d", static_cast<int32_t>(record.worldID)));
    case Cell::kCartelId:
      return PrintNumber(isUser, static_cast<int32_t>(record.cartelID), idWidth);
    case Cell::kName: {
      const char *name = record.isZombie ? "<zombie>" : texts_.At(record.name);
      return Fill(nameWidth_ + 2 - printf("  %s", Shown(name).text()));
    }
    case Cell::kChildren:
      printf("  %-9d", record.nChildren);
      return;
    case Cell::kThreads:
      printf("  %-8d", record.nThreads);
      return;
    case Cell::kGroup:
      return PrintNumber(record.groupID, idWidth);
    case Cell::kProcessGroup:
      return PrintNumber(isUser, record.processGroupID, idWidth);
    case Cell::kSession:
      return PrintNumber(isUser, record.sessionID, idWidth);
    case Cell::kParent:
      return PrintNumber(record.parentCartelID, idWidth);
    case Cell::kType:
      return PrintType(record.worldType);
    case Cell::kState:
      return PrintState(record);
    case Cell::kTime:
      if (!record.hasSchedStats) return;
      printf("  %5llu.%06llu", static_cast<unsigned long long>(record.usedTime / 1000000),
             static_cast<unsigned long long>(record.usedTime % 1000000));
      return;
    case Cell::kSecurityDomain:
      printf("  %-14d", record.securityDomain);
      return;
    case Cell::kUserspace:
      printf("  %-9d", static_cast<int32_t>(record.userspaceID));
      return;
    case Cell::kCommand:
      if (!isUser) return;
      Fill(2);
      fputs(Shown(texts_.At(record.commandLine)).text(), stdout);
  }
}

void PsPrinter::PrintRow(const WorldRecord &record) const {
  for (size_t i = 0; i < shownCount_; ++i) {
    if (!record.isZombie || shown_[i]->ofZombies) PrintCell(*shown_[i], record);
  }
  putchar_unlocked('\n');
}

void PsPrinter::PrintType(uint32_t worldType) const {
  constexpr int kLetterRoom = 6;
  int letters = 0;
  uint32_t rest = worldType;
  Fill(2);
  do {
    const WorldKind *kind = FindKind(rest & -rest);
    if (kind == nullptr) {
      fputs("Invalid", stdout);
      break;
    }
    rest &= rest - 1;
    if (Has(PS_VERBOSE)) {
      printf("%s%s", kind->name, rest != 0 ? "," : "");
    } else {
      putchar_unlocked(kind->letter);
      ++letters;
    }
  } while (rest != 0);
  Fill(Has(PS_VERBOSE) ? 2 : kLetterRoom - letters);
}

void PsPrinter::PrintState(const WorldRecord &record) const {
  if (record.isZombie || !record.hasSchedStats) {
    Fill(kBlankState);
    return;
  }
  const char *run =
      record.runState < runStates_ ? CpuSched_RunStateElements[record.runState].name : "?";
  const char *wait =
      record.waitState < waitStates_ ? CpuSched_WaitStateElements[record.waitState].name : "?";
  printf("  %-6.6s  %-6.6s  %-4s", run, wait, Shown(texts_.At(record.cpuText)).text());
}

bool PsPrinter::ReserveBranches(const WorldInventory &inventory) {
  size_t parents = 0;
  for (size_t i = 0; i < inventory.allCount; ++i) parents += inventory.all[i]->nChildren != 0;
  if (branches_.Reserve(parents * std::string_view(kVerticalLine).size())) return true;
  fputs("WorldList: Not enough memory\n", Messages());
  return false;
}

// Below a record with a later sibling a line goes on down to that sibling. The root has none, and
// what stands below it is only moved to the right.
void PsPrinter::PushBranch(const WorldRecord &record) {
  const std::string_view branch = BranchBelow(record);
  (void)branches_.Append(branch.data(), branch.size());  // there is room
}

void PsPrinter::PopBranch(const WorldRecord &record) {
  branches_.Truncate(branches_.size() - BranchBelow(record).size());
}

// Walks by the records' links, so that the depth of a tree costs no stack.
void PsPrinter::PrintTree(const WorldRecord &root) {
  int32_t level = 0;
  printf("%d\n", static_cast<int32_t>(root.userspaceID));
  for (const WorldRecord *record = &root; record != nullptr;) {
    if (level > deepestLevel) deepestLevel = level;
    fwrite_unlocked(branches_.text(), 1, branches_.size(), stdout);
    fputs(record->nextSibling != nullptr ? kBranch : kCorner, stdout);
    PrintRow(*record);
    if (record->firstChild != nullptr) {
      PushBranch(*record);
      ++level;
      record = record->firstChild;
      continue;
    }
    while (record->nextSibling == nullptr && record->parent != nullptr) {
      record = record->parent;
      PopBranch(*record);
      --level;
    }
    record = record->nextSibling;
  }
}
