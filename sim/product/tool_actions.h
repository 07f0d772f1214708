// What the product's configuration programs do to a world besides recording
// their run. Each works for one copy (the copy whose bin folder holds the
// program) and on the instance named by KXLINSTANCE. The product library's
// face for its own programs (sim/tools): they reach its state only through
// these calls.
#pragma once

#include <string>
#include <vector>

namespace kxlsim {

// kxlimaudcfg: marks the instance's "security\kxlaudit.cfg" as upgraded for
// the copy (a comment line "# upgraded for copy <copy>"). An instance without
// audit settings is left alone.
void upgradeAuditConfig(const std::string &copyName);

// kxlimsslcfg -c CLIENT -s SERVER: marks each of the two files that exists
// ("; upgraded for copy <copy>"); missing files are not created. Returns 2
// when an option or its file is missing, else 0.
int upgradeSslConfig(const std::string &copyName, const std::vector<std::string> &args);

// kxlset -cleanup: removes the copy's instance profile keys whose instance is
// not in the instance registry. Other arguments do nothing.
void cleanProfiles(const std::string &copyName, const std::vector<std::string> &args);

// Runs the work of `program` (a tool name without ".exe") for the copy that
// holds the running program; the exit code for a usage error, else 0.
int runToolWork(const std::string &program, int argc, char **argv);

} // namespace kxlsim
