// The loader of shared libraries against real plug-ins.
//
// SPDX-License-Identifier: MIT
#include <dlfcn.h>
#include <gtest/gtest.h>
#include <kel/services/load_library.h>

#include <string>
#include <vector>

#include "tests/support/child.h"

namespace {

using namespace kel::test;

typedef std::vector<std::string> Names;

const std::string folder = KEL_PLUGIN_FOLDER "/";

Outcome drive(const Names& actions) {
    Names program = {KEL_LOADER_DRIVER};
    program.insert(program.end(), actions.begin(), actions.end());
    return run_program(program, {"LD_LIBRARY_PATH=" KEL_PLUGIN_FOLDER});
}

TEST(LoadedPlugin, IsFoundByItsShortName) {
    const Outcome o = drive({"load", "alpha", "load", "beta"});
    EXPECT_EQ(o.out.substr(0, o.out.find("opened\nbeta opened\n") + 19), "alpha opened\nbeta opened\n")
        << o.err;
    EXPECT_EQ(o.exit_code, 0);
}

TEST(LoadedPlugin, IsFoundByItsFileName) {
    EXPECT_EQ(drive({"load", "gamma.so"}).out.substr(0, 13), "gamma opened\n");
}

TEST(LoadedPlugin, IsClosedByTheNameThatOpened) {
    const Outcome o = drive({"load", "alpha", "unload", "alpha", "load", "beta", "unload", "libalpha_r.so"});
    EXPECT_EQ(o.out.substr(0, 37), "alpha opened\nbeta opened\nalpha closed") << o.out;
}

TEST(LoadedPlugin, IsClosedByUnloadAll) {
    const Outcome o = drive({"load", "alpha", "load", "gamma.so", "unload-all", "-", "load", "beta"});
    EXPECT_LT(o.out.find("alpha closed"), o.out.find("beta opened"));
    EXPECT_LT(o.out.find("gamma closed"), o.out.find("beta opened"));
}

TEST(LoadedPlugin, ThatIsMissingIsReportedOnStandardError) {
    const Outcome o = drive({"load", "missing"});
    EXPECT_EQ(o.err, "LoadLibrary failed for [missing]: Exception: KELLoadLibrary::LoadError\n\n");
    EXPECT_EQ(o.exit_code, 0);
}

TEST(LoadedPlugin, GivesItsSymbolsThroughTheHandle) {
    KELLoadLibrary::instance()->Load((folder + "gamma.so").c_str());
    void* const handle = dlopen((folder + "gamma.so").c_str(), RTLD_LAZY | RTLD_NOLOAD);
    ASSERT_NE(handle, nullptr);
    typedef const char* (*PluginName)();
    const PluginName name = reinterpret_cast<PluginName>(dlsym(handle, "plugin_name"));
    ASSERT_NE(name, nullptr);
    EXPECT_STREQ(name(), "gamma");
    dlclose(handle);
    KELLoadLibrary::instance()->Unload((folder + "gamma.so").c_str());
    EXPECT_EQ(dlopen((folder + "gamma.so").c_str(), RTLD_LAZY | RTLD_NOLOAD), nullptr);
}

}  // namespace
