// The version banner: copied into szVerInfo when the library is loaded, so that it can be found
// in a memory dump of the player. Nothing in the library reads it.
#include <cstring>

namespace {

const char kBanner[] =
    "kaAbout> kaVMAPParser - release - android - armv8 - V3.19 - r93297 - NDKr10e - 11:04:12 "
    "Aug  1 2016\n";
static_assert(sizeof(kBanner) == 101, "the banner is 100 characters and a NUL");

}  // namespace

char szVerInfo[512];

class __CShowVersion {
public:
    __CShowVersion() { memcpy(szVerInfo, kBanner, sizeof(kBanner)); }
};

namespace {

__CShowVersion gShowVersion;

}  // namespace
