// testing.h - what every unit test uses: GoogleTest, the library, allocations that fail.
#pragma once

#include <gmock/gmock-matchers.h>
#include <gtest/gtest.h>

#include "support/failing_malloc.h"
#include "support/library.h"

using testing::HasSubstr, testing::Not;

// Runs `call` on what `make` makes, with each allocation refused in turn: it gives SOAP_OUT_OF_MEMORY then,
// and 0 without a refusal. `call` takes a reference; at least so many allocations are expected.
template <class Make, class Call>
void expect_out_of_memory_at_each_allocation(std::size_t least, Make make, Call call)
{
    auto subject = make();
    int result = -2;
    const std::size_t refusals = failing_malloc::at_each_allocation(
        failing_malloc::refuse::one, [&] { result = call(*subject); },
        [&](bool refused) {
            EXPECT_EQ(result, refused ? SOAP_OUT_OF_MEMORY : 0);
            subject = make();
        });
    EXPECT_GE(refusals, least);
}
