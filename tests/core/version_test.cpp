// The version of the headers and of the library.
// SPDX-License-Identifier: MIT
#include <dlfcn.h>
#include <gtest/gtest.h>
#include <kel/version.h>

#include <string>

namespace {

TEST(Version, LibraryIsAsOldAsItsHeaders) {
    EXPECT_STREQ(kel_version(), KEL_VERSION);
    EXPECT_EQ(kel_version_number(), KEL_VERSION_NUMBER);
}

TEST(Version, TextIsMadeOfTheThreeNumbers) {
    EXPECT_EQ(std::to_string(KEL_VERSION_MAJOR) + '.' + std::to_string(KEL_VERSION_MINOR) + '.' +
                  std::to_string(KEL_VERSION_PATCH),
              kel_version());
}

TEST(Version, NumberHasTwoDecimalPlacesForMinorAndPatch) {
    EXPECT_EQ(kel_version_number() / 10000, KEL_VERSION_MAJOR);
    EXPECT_EQ(kel_version_number() / 100 % 100, KEL_VERSION_MINOR);
    EXPECT_EQ(kel_version_number() % 100, KEL_VERSION_PATCH);
}

TEST(Version, ProgramsThatOpenTheLibraryFindTheFunctionsByTheirPlainNames) {
    EXPECT_NE(dlsym(RTLD_DEFAULT, "kel_version"), nullptr);
    EXPECT_NE(dlsym(RTLD_DEFAULT, "kel_version_number"), nullptr);
}

}  // namespace
