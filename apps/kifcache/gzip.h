// Recordings in gzip files.
#pragma once

#include <string>

#include "file_bytes.h"

// Expands a gzip file of any number of members into `*expanded`, which ReleaseFileBytes gives back.
// Null, or a text that says what is wrong: what is damaged or cut, has something behind it, or
// expands beyond kMostFileBytes, which is found out before anything of it is kept.
const char *Gunzip(const FileBytes &compressed, FileBytes *expanded);

// Compresses into one member that depends on nothing but the bytes. False without memory.
bool Gzip(const void *bytes, size_t size, std::string *compressed);
