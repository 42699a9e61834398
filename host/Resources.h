// Localised resource texts by number. The built-in table is English; an
// embedder overrides any text with host::setResourceText.
#pragma once

#include "host/HostExport.h"
#include "host/String.h"

enum ResStrFmt : int { ResStrFmt_Plain = 0, ResStrFmt_Upper = 1, ResStrFmt_Lower = 2 };

// The text of resource id in the given format; an unknown id gives
// "#<id>" so that a missing text is visible rather than silent.
HOST_API WString resourceStrW(int id, ResStrFmt format = ResStrFmt_Plain);
HOST_API WString resourceStrW(int id, int format);
// The text of id with before and after around it.
HOST_API WString paddedResourceStrW(int id, const WString& before, const WString& after);
