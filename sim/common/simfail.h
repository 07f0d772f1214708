// Fault injection, kill points and call counts for every platform function
// (product library and Win32 surface) and for the simulation's own hooks.
//
// KXLSIM_FAIL=name:n[,name:n...] makes the n-th call (counted from 1 in this
// process) of the named function fail the way that function reports failure.
// The same name may appear more than once to fail several calls.
//
// KXLSIM_KILL=name:n ends the process at once (exit code kKilledExitCode, no
// clean-up of any kind) at the n-th call of the named function or hook, as a
// power loss or a closed console would. Besides the platform functions there
// are two hooks: "trace" (each trace hook of the product library, whether or
// not a trace file is set) and "hivewrite" (each registry file written, after
// the new text is complete beside the hive and before it replaces the hive).
//
// KXLSIM_COUNT=FILE writes, when the process exits normally, one line
// "name count" per function or hook called in this process.
//
// All three belong to the process they are set for: programs it starts do not
// inherit them.
#pragma once

namespace kxlsim {

inline constexpr int kKilledExitCode = 137;

// Counts this call of `functionName` and returns true when it is to fail; may
// end the process when KXLSIM_KILL names this call. Cheap when none of the
// settings is present. Names are matched exactly (case-sensitive).
bool shouldFail(const char *functionName);

// Counts this call of the hook `hookName`; ends the process when KXLSIM_KILL
// names this call.
void killPoint(const char *hookName);

// Counts this call of the hook `hookName`; true when KXLSIM_KILL names it, for
// hooks that leave a half-done write behind before killNow().
bool killDue(const char *hookName);
[[noreturn]] void killNow();

// One call of an entry point of a simulated system service (the cluster),
// counted and failed as the entry point. While it runs, the platform
// functions the service calls on its own behalf are neither counted nor
// failed: on Windows they run in the service's process, out of reach of the
// command's faults. Hooks (kill points) still count.
class ServiceCall {
public:
  explicit ServiceCall(const char *entryPoint);
  ~ServiceCall();
  ServiceCall(const ServiceCall &) = delete;
  ServiceCall &operator=(const ServiceCall &) = delete;
  bool failing() const { return failing_; }

private:
  bool failing_;
};

// Clears the call counters and re-reads the settings (for tests that change them).
void resetFaults();

// True for an environment entry ("NAME=value") that a started program must
// not inherit from this process.
bool isOwnProcessSetting(const char *entry);

} // namespace kxlsim
