// The entries of the sixteen tools. Each takes the argument count and the null-terminated argument
// vector, whose first element is the tool's word, and gives the exit status: 0, a small number, or
// a KIF_Status whose low eight bits the system keeps.
#pragma once

int LspciEntry(int argc, char **argv);
int PsEntry(int argc, char **argv);
int HwclockEntry(int argc, char **argv);
int ZelvarEntry(int argc, char **argv);
int IrqinfoEntry(int argc, char **argv);
int BootOptionEntry(int argc, char **argv);
int AmldumpEntry(int argc, char **argv);
int PciInfoEntry(int argc, char **argv);
int PidofEntry(int argc, char **argv);
int UserspaceofEntry(int argc, char **argv);
int MduEntry(int argc, char **argv);
int LsofEntry(int argc, char **argv);
int MdfEntry(int argc, char **argv);
int PkillEntry(int argc, char **argv);
int PgrepEntry(int argc, char **argv);
int UptimeEntry(int argc, char **argv);
