// Every public header of the tonebits library.
#pragma once

#include "tonebits/export.h"
#include "tonebits/foundation/Aud__SampleConversion.h"
#include "tonebits/foundation/Aud__Simd.h"
#include "tonebits/foundation/Aud__Status.h"
#include "tonebits/foundation/Aud__StreamBuffer.h"
#include "tonebits/dsp/Aud__Biquad.h"
#include "tonebits/dsp/Aud__MultiBandBiquad.h"
#include "tonebits/dsp/Aud__ScopedNoDenormals.h"
