// Every public header of the tonebits library.
#pragma once

#include "tonebits/export.h"
#include "tonebits/foundation/Aud__ChannelCache.h"
#include "tonebits/foundation/Aud__Interleaver.h"
#include "tonebits/foundation/Aud__Metadata.h"
#include "tonebits/foundation/Aud__SampleConversion.h"
#include "tonebits/foundation/Aud__Simd.h"
#include "tonebits/foundation/Aud__Status.h"
#include "tonebits/foundation/Aud__StreamBuffer.h"
