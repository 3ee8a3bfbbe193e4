// Out of memory: said once, for all of kifcache.
#pragma once

// Makes every allocation that fails end the process with a message and status 1.
void EndWhenOutOfMemory();
