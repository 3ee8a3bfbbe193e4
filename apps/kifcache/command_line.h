// The commands of kifcache and what each takes: usage, help, completion and parsing come from the
// same rows.
#pragma once

#include <stdio.h>

#include <string>
#include <vector>

struct Option {
  const char *name;      // a long one, without its dashes
  const char *argument;  // what stands behind it, as the usage shows it; null: nothing
  const char *help;
};

// What a command line gives to a command.
struct Arguments {
  struct Choice {
    const Option *option;
    const char *argument;
  };
  std::vector<Choice> options;  // in the order of the command line
  std::vector<const char *> operands;

  bool Has(const Option &option) const;
  // The argument of an option, the last one; null where it was not given.
  const char *Of(const Option &option) const;
};

struct Command {
  const char *name;
  // As the usage shows them: what may be left out in brackets, "..." behind what may be repeated.
  const char *operands;
  const char *help;
  int (*run)(const Arguments &given);  // gives the exit status
  const Option *options[12];           // the rest is null
};

// The rows up to the one without a name.
extern const Command kCommands[];

// Runs the command that the arguments of the program name, and gives its exit status; 1 after a
// message for a mistake in them.
int RunCommandLine(int argc, char **argv);
