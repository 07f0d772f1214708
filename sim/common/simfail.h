// Fault injection for every platform function (product library and Win32 surface).
//
// KXLSIM_FAIL=name:n[,name:n...] makes the n-th call (counted from 1 in this
// process) of the named function fail the way that function reports failure.
// The same name may appear more than once to fail several calls.
#pragma once

namespace kxlsim {

// Counts this call of `functionName` and returns true when it is to fail.
// Cheap when KXLSIM_FAIL is unset. Names are matched exactly (case-sensitive).
bool shouldFail(const char *functionName);

// Clears the call counters and re-reads KXLSIM_FAIL (for tests that change it).
void resetFaults();

} // namespace kxlsim
