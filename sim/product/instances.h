// Process-wide state of the instance family. Internal to the product library.
#pragma once

namespace kxlprod {

// Forgets what creations and partition entries of this process would put back.
void resetInstanceState();

// Releases the application environment's partition table.
void resetApplicationEnvironment();

} // namespace kxlprod
