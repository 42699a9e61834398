// Symbol export for the host services library. Everything not marked
// HOST_API stays hidden.
#pragma once

#define HOST_API __attribute__((visibility("default")))
