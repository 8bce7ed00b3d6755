#include "platform/sdk_object.h"

int CSDKObject::g_kaSDKObjectNum = 0;

CSDKObject::CSDKObject() { ++g_kaSDKObjectNum; }

CSDKObject::~CSDKObject() { --g_kaSDKObjectNum; }
