// String helpers of the web-API framework.

#include "appliance/base/text.h"
#include "appliance/platform/contract.h"

namespace WebUtils {

std::vector<std::string> StringExplode(const std::string& text, const std::string& separator) {
    return appliance::Split(text, separator);
}

std::string StringImplode(const std::vector<std::string>& pieces, const std::string& separator) {
    std::string joined;
    const char* between = "";
    for (const std::string& piece : pieces) {
        joined += between + piece;
        between = separator.c_str();
    }
    return joined;
}

}  // namespace WebUtils
