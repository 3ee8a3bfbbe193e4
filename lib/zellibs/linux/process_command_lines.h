// The command lines of processes: those kept while cartels were listed, each for one answer, and
// the one read last, for the threads of a process that are asked for in a row.
#pragma once

#include "linux/processes.h"

// Reads the command line of a process, which its thread `thread` tells, below `proc`, an open
// /proc, as the record has it.
KIF_Status ReadCommandLineFile(int proc, int32_t id, int32_t thread, char *text);

// Keeps the command line of a process until it is taken. False without memory.
bool KeepCommandLine(const char *text, Process *process);
void ClearCommandLines();

// The command line read last serves once more for `process`; or not at all.
void AllowLastCommandLine(int32_t process);
void ForgetCommandLine();

// Gives a command line: the one kept for `process` (null: the picture has none of that ID), the one
// read last, or that of the file.
KIF_Status TakeCommandLine(int proc, int32_t id, Process *process, char *text);
