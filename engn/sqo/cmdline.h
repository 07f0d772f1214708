// The command line of the upgrade command: options and the instance name.
#pragma once

#include "upgrade/records.h"

// Reads every argument after the program name into `options` (cleared by the
// caller). 0 when the command line is complete and valid, else the negative
// code of the first error; the fields filled before it stay as they are.
int parseCommandLine(int argc, const char *const *argv, UpgradeOptions *options);
