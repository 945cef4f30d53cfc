#pragma once

// The one place that says which version of the library's interface is meant. Included by this folder alone.
#define FUSE_USE_VERSION 314

#include <fuse_lowlevel.h>
