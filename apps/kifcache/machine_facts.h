// The facts of the machine that a recording tells of.
#pragma once

#include "host_model.h"
#include "recording_clock.h"

// Who is recorded by whom, as far as the host is this machine or says so itself.
void TellOfMachine(Facts *facts);

// What only this machine has, where it is the host.
void TellOfBoot(const RecordingClock &clock, Facts *facts);
