// Where Windows Installer keeps a machine-wide product: the registry keys that
// the real installer reads, so a world imported into Windows or Wine answers
// the same as the simulated machine.
#pragma once

#include <string>

namespace kxlsim {

// The product code's packed form: the braced GUID without braces and dashes,
// the first three groups reversed and each following byte's two digits
// swapped. "" when the code is not a braced GUID.
std::string packedProductCode(const std::string &productCode);

// HKLM key of the product's advertisement ("" for a malformed code).
std::string installerProductKey(const std::string &productCode);

// HKLM key of the product's installed properties ("InstallLocation",
// "WindowsInstaller", ...); "" for a malformed code.
std::string installerPropertiesKey(const std::string &productCode);

} // namespace kxlsim
