// testing.h - what every unit test uses: GoogleTest, the library, allocations that fail.
#pragma once

#include <gtest/gtest.h>

#include "support/failing_malloc.h"
#include "support/library.h"
