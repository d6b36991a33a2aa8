// The library's diagnostics. Lines go to standard error unless the host installs a sink
// (PlatformRegistry::setLogSink); tests install one to capture them.
#pragma once

#include <string_view>

#include "Corvelbase/Export.h"

namespace corvel {

// Writes one diagnostic line (without its line feed). Safe from any thread.
CORVEL_EXPORT void logMessage(std::string_view line);

}  // namespace corvel
