// What every tool may use of the front end: the exported helpers and the cache flag.
#pragma once

#include <stddef.h>
#include <stdint.h>

#pragma GCC visibility push(default)
extern "C" {

// Writes the formatted message to standard error, at most 1023 characters of it and with no line
// break of its own, and ends the process with status 1.
[[noreturn]] void Panic(const char *format, ...) __attribute__((format(printf, 1, 2)));

// As Panic, but returns.
void Warning(const char *format, ...) __attribute__((format(printf, 1, 2)));

// 1 when the run reads a cache file, 0 when it is live; set before any tool runs.
extern uint8_t InvokedWithCache;
}
#pragma GCC visibility pop

// Renders a count of `bytes` with the unit "M", "K" or "B", truncated, into `size` bytes of
// `buffer`.
void FormatSize(uint64_t bytes, char *buffer, size_t size);
