// The states of a world, as places in the state tables of the library's face.
#pragma once

#include <cstdint>

#define RUN_STATES(STATE)  \
  STATE(kRun, "RUN")       \
  STATE(kSleep, "SLEEP")   \
  STATE(kDisk, "DISK")     \
  STATE(kStop, "STOP")     \
  STATE(kTrace, "TRACE")   \
  STATE(kPark, "PARK")     \
  STATE(kIdle, "IDLE")     \
  STATE(kZombie, "ZOMBIE") \
  STATE(kDead, "DEAD")     \
  STATE(kOther, "OTHER")
#define WAIT_STATES(STATE)         \
  STATE(kNone, "NONE")             \
  STATE(kInterruptible, "INTR")    \
  STATE(kUninterruptible, "UNINT") \
  STATE(kSignal, "SIGNAL")         \
  STATE(kTracer, "TRACER")         \
  STATE(kUnpark, "UNPARK")

#define STATE(place, name) place,
enum RunState : uint32_t { RUN_STATES(STATE) };
enum WaitState : uint32_t { WAIT_STATES(STATE) };
#undef STATE
