// String helpers of the web-API framework.
// See conventions.h for the rules that hold for every declaration.

#ifndef VORN_PLATFORM_WEBUTILS_H
#define VORN_PLATFORM_WEBUTILS_H

#include <string>
#include <vector>

#include "platform/conventions.h"

namespace WebUtils {

// The pieces of `text` between the separators, in order, empty ones included and nothing trimmed. An empty text has no
// pieces.
// Failure: throws.
std::vector<std::string> StringExplode(const std::string& text, const std::string& separator);

// The pieces joined with the separator between each two. No pieces give an empty text.
// Failure: throws.
std::string StringImplode(const std::vector<std::string>& pieces, const std::string& separator);

}  // namespace WebUtils

#endif
