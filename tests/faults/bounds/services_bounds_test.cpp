// The size limit of the log and the number of arguments.
// SPDX-License-Identifier: MIT
#include <kel/exceptions/standard.h>
#include <kel/services/arg_list.h>
#include <kel/services/debug_logger.h>

#include <cstring>
#include <memory>

#include "tests/faults/bounds/bounds.h"

using kel::test::refused;

// The limit is kept in bytes, of which there are 32 bits.
AT_BOUNDS(LogLimit, WrapsAt32BitsOfBytes, "kel/services/debug_logger.h", "kb") {
    KELDebugLogger log;
    log.setTrimSize(n);
    EXPECT_EQ(log._trim_size, n == 0 ? 1024u * 1024u : n * 1024u);
}

// There is one argument, and the array ends behind it.
AT_BOUNDS(Arguments, AreReadUpToTheirNumber, "kel/services/arg_list.h", "argc") {
    char option[] = "-PxName";
    const std::unique_ptr<char*[]> argv(new char* [1] { option });
    KELArgList options;
    int argc = static_cast<int>(n);
    if (n == 0x7fffffff) {
        EXPECT_TRUE(refused([&] { options.argInit(argc, argv.get(), "-Px"); }));
    } else {
        options.argInit(argc, argv.get(), "-Px");
    }
    EXPECT_EQ(argc, n == 1 ? 0 : static_cast<int>(n));
    EXPECT_EQ(argv[0], option);
    EXPECT_EQ(options.getArgCount(), n == 1 ? 1u : 0u);
}
