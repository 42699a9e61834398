// Symbol export for the tonebits library: the default visibility is hidden,
// and only what is marked TONEBITS_API is part of the library's interface.
#pragma once

#define TONEBITS_API __attribute__((visibility("default")))
