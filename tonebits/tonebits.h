// Every public header of the tonebits library.
#pragma once

#include "tonebits/export.h"
#include "tonebits/foundation/Aud__SampleConversion.h"
#include "tonebits/dsp/Aud__GainCurve.h"
#include "tonebits/foundation/Aud__Simd.h"
#include "tonebits/foundation/Aud__Status.h"
#include "tonebits/foundation/Aud__StreamBuffer.h"
#include "tonebits/mixer/Aud__SimpleMixState.h"
