// The daemon's only loop: one read is one command line.
#pragma once

#include "core/transport.h"

// Waits for one read that begins with "AT" (any case); returns the line or null.
char* readline(SerialDevice* device);
// Serves lines until one of 200 characters or more arrives.
void readerLoop(SerialDevice* device);
