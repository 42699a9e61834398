// Every public header of the tonebits library.
#pragma once

#include "tonebits/export.h"
#include "tonebits/foundation/Aud__AudioPreferences.h"
#include "tonebits/foundation/Aud__FrameCadence.h"
#include "tonebits/foundation/Aud__PlaybackFactor.h"
#include "tonebits/foundation/Aud__SampleConversion.h"
#include "tonebits/foundation/Aud__SamplePosition.h"
#include "tonebits/foundation/Aud__SampleRate.h"
#include "tonebits/foundation/Aud__Simd.h"
#include "tonebits/foundation/Aud__Status.h"
#include "tonebits/foundation/Aud__StreamBuffer.h"
#include "tonebits/io/Aud__IO_Caps.h"
#include "tonebits/metering/Aud__Monitor.h"
#include "tonebits/metering/Aud__MonitoringPoint.h"
#include "tonebits/metering/Aud__MonitoringPointManager.h"
