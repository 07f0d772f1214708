// The error trace point of an operation of the command: one object per
// operation, called with the failing step's probe and result; it gives the
// result back so that a step can trace and return in one statement.
#pragma once

#include "platform/kxlsys.h"

#include <cstdint>

struct ErrorTrace {
  uint32_t function;

  int32_t operator()(uint32_t probe, int32_t rc) const {
    pdtError(function, probe, rc);
    return rc;
  }
};
