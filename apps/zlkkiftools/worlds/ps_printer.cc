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

void PrintFilled(const char *text, int fill) {
  fputs(text, stdout);
  Fill(fill);
}

}  // namespace

PsPrinter::PsPrinter(PsOptions options, const WorldTexts &texts)
    : options_(options),
      texts_(texts),
      idWidth_(snprintf(nullptr, 0, "%d", static_cast<int32_t>(maxWorldID))),
      nameWidth_(static_cast<int>(maxNameLength)),
      runStates_(CountStates(CpuSched_RunStateElements)),
      waitStates_(CountStates(CpuSched_WaitStateElements)) {}

void PsPrinter::PrintHeader() const {
  if (Has(PS_TREE)) fputs("  ", stdout);
  PrintFilled("WID", idWidth_ - 3);
  PrintFilled("  CID", idWidth_ - 3);
  PrintFilled("  WorldName", nameWidth_ - 9);
  if (Has(PS_NCHILDREN)) PrintFilled("  nChildren", 0);
  if (Has(PS_NTHREADS)) PrintFilled("  nThreads", 0);
  if (Has(PS_GID)) PrintFilled("  GID", idWidth_ - 4);
  if (Has(PS_PGID_SID)) {
    PrintFilled("  PGID", idWidth_ - 5);
    PrintFilled("  SID", idWidth_ - 4);
  }
  if (Has(PS_PCID)) PrintFilled("  PCID", idWidth_ - 4);
  if (Has(PS_TYPE)) PrintFilled("  Type  ", 0);
  if (Has(PS_STATE)) PrintFilled("  State   Wait    CPU ", 0);
  if (Has(PS_TIME)) PrintFilled("  Time", 8);
  if (Has(PS_SECURITY_DOMAIN)) PrintFilled("  SecurityDomain", 0);
  if (Has(PS_USERSPACE)) PrintFilled("  UserSpace", 0);
  if (Has(PS_COMMAND)) PrintFilled("  Command", 0);
  putchar('\n');
}

void PsPrinter::PrintRow(const WorldRecord &record) const {
  const bool isWorld = !record.isZombie;
  PrintIds(record);
  if (Has(PS_NCHILDREN) && Has(PS_TREE) && isWorld) printf("  %-9d", record.nChildren);
  if (Has(PS_NTHREADS) && Has(PS_TREE) && isWorld) printf("  %-8d", record.nThreads);
  if (Has(PS_GID) && isWorld) PrintNumber(record.groupID, idWidth_);
  if (Has(PS_PGID_SID)) PrintGroups(record);
  if (Has(PS_PCID)) PrintNumber(record.parentCartelID, idWidth_ + 2);
  if (Has(PS_TYPE) && isWorld) PrintType(record.worldType);
  if (Has(PS_STATE)) PrintState(record);
  if (Has(PS_TIME) && isWorld && record.hasSchedStats) {
    printf("  %5llu.%06llu", static_cast<unsigned long long>(record.usedTime / 1000000),
           static_cast<unsigned long long>(record.usedTime % 1000000));
  }
  if (Has(PS_SECURITY_DOMAIN) && isWorld) printf("  %-14d", record.securityDomain);
  if (Has(PS_USERSPACE) && isWorld) printf("  %-9d", static_cast<int32_t>(record.userspaceID));
  if (Has(PS_COMMAND) && isWorld && record.cartelID != 0) {
    fputs("  ", stdout);
    fputs(Shown(texts_.At(record.commandLine)).text(), stdout);
  }
  putchar('\n');
}

void PsPrinter::PrintIds(const WorldRecord &record) const {
  Fill(idWidth_ - printf("%d", static_cast<int32_t>(record.worldID)));
  if (record.cartelID != 0) {
    PrintNumber(static_cast<int32_t>(record.cartelID), idWidth_);
  } else {
    PrintFilled("  0", idWidth_ - 1);
  }
  const char *name = record.isZombie ? "<zombie>" : texts_.At(record.name);
  Fill(nameWidth_ + 2 - printf("  %s", Shown(name).text()));
}

void PsPrinter::PrintGroups(const WorldRecord &record) const {
  if (record.cartelID != 0) {
    PrintNumber(record.processGroupID, idWidth_ - 2);
    PrintNumber(record.sessionID, idWidth_ - 2);
  } else {
    PrintFilled("  0", idWidth_ - 3);
    PrintFilled("  0", idWidth_ - 3);
  }
}

void PsPrinter::PrintType(uint32_t worldType) const {
  constexpr int kLetterRoom = 6;
  int letters = 0;
  uint32_t rest = worldType;
  fputs("  ", stdout);
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
      putchar(kind->letter);
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

// Below a record with a later sibling a line goes on down to that sibling. The root has none, and
// what stands below it is only moved to the right.
bool PsPrinter::PushBranch(const WorldRecord &record) {
  if (branchesLength_ + sizeof(kVerticalLine) > branchesRoom_) {
    const size_t room = branchesRoom_ > 0 ? branchesRoom_ * 2 : 4096;
    void *grown = realloc(branches_.get(), room);
    if (grown == nullptr) {
      fputs("WorldList: Not enough memory\n", stderr);
      return false;
    }
    (void)branches_.release();
    branches_.reset(static_cast<char *>(grown));
    branchesRoom_ = room;
  }
  const std::string_view branch = BranchBelow(record);
  memcpy(branches_.get() + branchesLength_, branch.data(), branch.size());
  branchesLength_ += branch.size();
  return true;
}

void PsPrinter::PopBranch(const WorldRecord &record) {
  branchesLength_ -= BranchBelow(record).size();
}

// Walks by the records' links, so that the depth of a tree costs no stack.
bool PsPrinter::PrintTree(const WorldRecord &root) {
  int32_t level = 0;
  printf("%d\n", static_cast<int32_t>(root.userspaceID));
  for (const WorldRecord *record = &root; record != nullptr;) {
    if (level > deepestLevel) deepestLevel = level;
    fwrite_unlocked(branches_.get(), 1, branchesLength_, stdout);
    fputs(record->nextSibling != nullptr ? kBranch : kCorner, stdout);
    PrintRow(*record);
    if (record->firstChild != nullptr) {
      if (!PushBranch(*record)) return false;
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
  return true;
}
