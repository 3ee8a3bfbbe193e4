// Reads the worlds or cartels of the host into records.
#pragma once

#include "worlds/ps_options.h"
#include "worlds/world_record.h"

// Reads what `options` ask for into the inventory's worlds and zombies, and counts the entries of
// the host's list in `*total`. False, after a message on standard error, where the listing cannot
// go on.
bool ReadWorlds(PsOptions options, WorldInventory *inventory, uint32_t *total);
