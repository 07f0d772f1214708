// Process-wide state of the product library that tests reset between cases.
// Internal to the product library.
#pragma once

namespace kxlprod {

// Forgets handed-out environment values and a running profile enumeration.
void resetProfileState();

// Every piece of process-wide state: the installation switch, the above, the
// instance family's undo records and the application environment.
void resetLibraryState();

} // namespace kxlprod
