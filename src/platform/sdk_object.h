// Base of every library object: keeps a process-wide count of live objects, which tests and
// hosts read to see that nothing was left behind.
#pragma once

class CSDKObject {
public:
    CSDKObject();
    virtual ~CSDKObject();

    // Live objects; plain integer, the library takes no locks.
    static int g_kaSDKObjectNum;
};
