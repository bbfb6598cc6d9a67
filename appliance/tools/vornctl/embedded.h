// The catalogues as they stand in appliance/catalogue/; the build makes the source of these from them.

#ifndef VORN_APPLIANCE_TOOLS_VORNCTL_EMBEDDED_H
#define VORN_APPLIANCE_TOOLS_VORNCTL_EMBEDDED_H

namespace appliance::ctl {

extern const char kEmbeddedErrorCodes[];
extern const char kEmbeddedMethods[];

}  // namespace appliance::ctl

#endif
