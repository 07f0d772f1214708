// Diagnostics of the product library. Internal; the tests use it directly.
#pragma once

#include <string>

namespace kxlprod {

// Forgets the cached KXLTRACE setting (tests that change it).
void resetTrace();

// Host path of the diagnostic log: kxldiag.log beside the world's event log
// ("" when there is no world).
std::string diagnosticLogPath();

} // namespace kxlprod
