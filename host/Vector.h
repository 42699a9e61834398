// The host's growable array: a standard vector whose storage comes from the
// host heap.
#pragma once

#include <vector>

#include "host/OS.h"

template <class T>
using Vector = std::vector<T, StdAllocator<T>>;
