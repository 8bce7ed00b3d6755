/* Hook for C++ hosts that want the content of VAST <Extensions> elements: install a
 * CExtensionParser on a VAST parser with SetParam(KA_PID_VAST_EXTENSION_PARSER, parser). C code
 * sees the results only as the opaque CAdExtensions pointers of the records. */
#ifndef KA_VAST_EXTENSION_H
#define KA_VAST_EXTENSION_H

#include <stdint.h>

#include "ka/vast_records.h"

#ifdef __cplusplus

// Whatever a host builds from one <Extensions> element. The ad that receives it owns it and
// destroys it through this virtual destructor when the ad is released.
class CAdExtensions {
public:
    virtual ~CAdExtensions() = default;
};

// Supplied by the host. The VAST parser owns it once installed and destroys it when it closes,
// which happens at the end of every Process: install it again before the next one.
class CExtensionParser {
public:
    virtual ~CExtensionParser() = default;
    // Reads one <Extensions> element (a node of the parser's XML module); 0 on success.
    virtual uint32_t Parse(void* node) = 0;
    // After a successful Parse: a fresh object whose ownership passes to the ad, or null.
    virtual CAdExtensions* GetResult() = 0;
};

#endif /* __cplusplus */

#endif /* KA_VAST_EXTENSION_H */
