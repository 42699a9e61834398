// Every host service header.
#pragma once

#include "host/Config.h"
#include "host/Exception.h"
#include "host/HostExport.h"
#include "host/HostHooks.h"
#include "host/IdStamp.h"
#include "host/Lock.h"
#include "host/Log.h"
#include "host/NamedObjects.h"
#include "host/OS.h"
#include "host/ProjectTime.h"
#include "host/Ptr.h"
#include "host/Resources.h"
#include "host/String.h"
#include "host/Vector.h"
