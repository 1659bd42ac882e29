// KelvraSDK: include this header and link the import library (libKelvraSDK.dll.a).
#pragma once

#include "KelvraApi.h"
#include "KelvraBytes.h"
#include "KelvraEventLog.h"
#include "KelvraHttp.h"
#include "KelvraIni.h"
#include "KelvraLocks.h"
#include "KelvraStrings.h"
#include "KelvraThread.h"
#include "KelvraTrace.h"
