#include "command_line.h"

#include <getopt.h>
#include <unistd.h>

#include <cstring>
#include <string_view>

#include "messages.h"

namespace {

constexpr int kHelp = 'h';
constexpr int kFirstOption = 256;  // the rest stand behind it, in the order of the command's row

const Command *FindCommand(std::string_view name) {
  for (const Command *command = kCommands; command->name != nullptr; ++command) {
    if (name == command->name) return command;
  }
  return nullptr;
}

std::string Spelled(const Option &option) {
  const std::string name = std::string("--") + option.name;
  return option.argument != nullptr ? name + " " + option.argument : name;
}

std::string UsageOf(const Command &command) {
  std::string usage = std::string("usage: kifcache ") + command.name;
  for (const Option *const *option = command.options; *option != nullptr; ++option) {
    usage += " [" + Spelled(**option) + "]";
  }
  return usage + (*command.operands != '\0' ? " " : "") + command.operands + "\n";
}

void PrintRow(const std::string &what, const char *help, FILE *stream) {
  fprintf(stream, "  %-22s %s\n", what.c_str(), help);
}

void PrintOptions(const Command &command, const char *indent, FILE *stream) {
  for (const Option *const *option = command.options; *option != nullptr; ++option) {
    PrintRow(indent + Spelled(**option), (*option)->help, stream);
  }
}

void PrintUsage(FILE *stream) {
  fputs("usage: kifcache COMMAND [OPTION...] [OPERAND...]\n", stream);
  for (const Command *command = kCommands; command->name != nullptr; ++command) {
    PrintRow(std::string(command->name) + " " + command->operands, command->help, stream);
    PrintOptions(*command, "  ", stream);
  }
  PrintRow("--help", "show this, and after a command what that one takes", stream);
  PrintRow("--version", "show the versions of the program, the library and the file format",
           stream);
  fputs("In the place of a file, - is standard input or output.\n", stream);
}

void PrintHelp(const Command &command) {
  fputs(UsageOf(command).c_str(), stdout);
  printf("  %s\n", command.help);
  PrintOptions(command, "", stdout);
}

// A mistake in the arguments of a command.
int Refuse(const Command &command, const std::string &mistake) {
  Complain(command.name, mistake);
  fputs(UsageOf(command).c_str(), stderr);
  return 1;
}

// The words of the bash completion: of the program, or behind one of its commands.
int PrintWords(const char *name) {
  const Command *command = name != nullptr ? FindCommand(name) : nullptr;
  if (command != nullptr) {
    puts("--help");
    for (const Option *const *option = command->options; *option != nullptr; ++option) {
      printf("--%s%s\n", (*option)->name, (*option)->argument != nullptr ? "=" : "");
    }
    if (*command->operands != '\0') puts("FILE");
  } else if (name == nullptr) {
    for (command = kCommands; command->name != nullptr; ++command) puts(command->name);
    puts("--help\n--version");
  }
  return 0;
}

// The next operand that a usage names; empty behind the last one.
std::string_view NextOperand(std::string_view *operands) {
  const size_t length = operands->find(' ');
  const std::string_view operand = operands->substr(0, length);
  operands->remove_prefix(length == operands->npos ? operands->size() : length + 1);
  return operand;
}

// What is wrong with the number of operands; empty: nothing.
std::string MistakeInOperands(const Command &command, const Arguments &given) {
  std::string_view operands = command.operands;
  size_t place = 0;
  while (!operands.empty()) {
    const std::string_view operand = NextOperand(&operands);
    if (operand.find("...") != operand.npos && place < given.operands.size()) return {};
    if (place >= given.operands.size()) {
      return operand[0] == '[' ? "" : std::string(operand) + " is missing";
    }
    ++place;
  }
  if (place == given.operands.size()) return {};
  return std::string(given.operands[place]) + " is one too many";
}

// The long options of a command, in the form of getopt_long.
std::vector<option> LongOptions(const Command &command) {
  std::vector<option> options = {{"help", no_argument, nullptr, kHelp}};
  for (const Option *const *row = command.options; *row != nullptr; ++row) {
    const int value = kFirstOption + static_cast<int>(row - command.options);
    const int takes = (*row)->argument != nullptr ? required_argument : no_argument;
    options.push_back({(*row)->name, takes, nullptr, value});
  }
  options.push_back({});
  return options;
}

// The word of the command line that getopt_long has just read an option from.
const char *LastRead(char **argv) {
  const bool hasArgument = optarg != nullptr && optarg == argv[optind - 1];
  return argv[optind - (hasArgument ? 2 : 1)];
}

// Of a script that abbreviates an option, the next option would change the meaning.
bool IsAbbreviated(std::string_view word, std::string_view name) {
  return word.starts_with("--") && word.substr(2, word.find('=') - 2) != name;
}

std::string MistakeInOption(int result, const char *word) {
  if (result == ':') return std::string(word) + " needs an argument";
  if (optopt >= kFirstOption || optopt == kHelp) {
    return std::string(word).substr(0, strcspn(word, "=")) + " takes no argument";
  }
  if (optopt != 0) return std::string("unknown option -") + static_cast<char>(optopt);
  return std::string("unknown option ") + word;
}

// Runs a command on the arguments from its name on.
int Run(const Command &command, int argc, char **argv) {
  const std::vector<option> options = LongOptions(command);
  Arguments given;
  opterr = 0;
  int row = 0;
  for (int result; (result = getopt_long(argc, argv, ":h", options.data(), &row)) != -1;) {
    const bool isLong = result >= kFirstOption;
    if (result == ':' || result == '?') {
      return Refuse(command, MistakeInOption(result, argv[optind - 1]));
    }
    const char *word = LastRead(argv);
    if ((isLong || result == kHelp) && IsAbbreviated(word, options[row].name)) {
      return Refuse(command, std::string("unknown option ") + word + ": write --" +
                                 options[row].name + " out");
    }
    if (result == kHelp) {
      PrintHelp(command);
      return 0;
    }
    given.options.push_back({command.options[result - kFirstOption], optarg});
  }
  given.operands.assign(argv + optind, argv + argc);
  const std::string mistake = MistakeInOperands(command, given);
  return mistake.empty() ? command.run(given) : Refuse(command, mistake);
}

}  // namespace

bool Arguments::Has(const Option &option) const {
  for (const Choice &choice : options) {
    if (choice.option == &option) return true;
  }
  return false;
}

const char *Arguments::Of(const Option &option) const {
  const char *argument = nullptr;
  for (const Choice &choice : options) {
    if (choice.option == &option) argument = choice.argument;
  }
  return argument;
}

int RunCommandLine(int argc, char **argv) {
  const std::string_view name = argc > 1 ? argv[1] : "";
  if (const Command *command = FindCommand(name)) return Run(*command, argc - 1, argv + 1);
  if (name == "--words") return PrintWords(argc > 2 ? argv[2] : nullptr);
  if (name == "--help" || name == "-h") {
    PrintUsage(stdout);
    return 0;
  }
  if (name.empty()) {
    fputs("kifcache: a command is missing\n", stderr);
    PrintUsage(stderr);
  } else if (name[0] == '-') {
    Complain(name, "a command comes first, and its options behind it: see kifcache --help");
  } else if (access(argv[1], F_OK) == 0) {
    Complain(name, "no command: kifcache check FILE tells what is in a file");
  } else {
    Complain(name, "no such command: see kifcache --help");
  }
  return 1;
}
