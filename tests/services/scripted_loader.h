// What the tests of the loader share: a system of libraries that exist on paper only.
//
//   ErrorText           what is written to std::cerr while it lives
//   LoadLibraryTest     fixture: a loader whose opening and closing of libraries is scripted
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_SERVICES_SCRIPTED_LOADER_H
#define KEL_TESTS_SERVICES_SCRIPTED_LOADER_H

#include <gtest/gtest.h>
#include <kel/services/load_library.h>

#include <iostream>
#include <set>
#include <sstream>
#include <string>
#include <vector>

#include "tests/support/fault.h"

namespace kel {
namespace test {

typedef std::vector<std::string> Names;

// Keeps what is written to std::cerr, which stays the stream it is.
class ErrorText {
public:
    ErrorText() : _usual(std::cerr.rdbuf(_text.rdbuf())) {}
    ~ErrorText() { std::cerr.rdbuf(_usual); }
    std::string str() const { return _text.str(); }

private:
    std::ostringstream _text;
    std::streambuf* _usual;
};

// A system in which the libraries of `available` exist and nothing else.
class LoadLibraryTest : public FaultTest {
protected:
    void SetUp() override {
        FaultTest::SetUp();
        seams::dlopen.script([this](const char* file, int mode) { return open(file, mode); });
        seams::dlclose.script([this](void* handle) { return close(handle); });
        seams::dlerror.script([this] { return problem; });
    }

    void TearDown() override {
        FaultTest::TearDown();
        for (std::string* handle : opened) delete handle;
    }

    void* open(const char* file, int mode) {
        tried.push_back(file);
        modes.insert(mode);
        if (!all_available && available.count(file) == 0) return nullptr;
        std::string* const handle = new std::string(file);
        opened.insert(handle);
        return handle;
    }

    int close(void* handle) {
        std::string* const name = static_cast<std::string*>(handle);
        EXPECT_EQ(opened.erase(name), 1u);
        closed.push_back(*name);
        delete name;
        return close_result;
    }

    typedef KELDictionary<CORBA_String_var, void*> Table;

    // The loader's table, its first field.
    Table& table() { return *reinterpret_cast<Table*>(&loader); }

    void load(const std::string& name) {
        Armed armed;
        loader.Load(name.c_str());
    }
    void unload(const std::string& name) {
        Armed armed;
        loader.Unload(name.c_str());
    }
    void unload_all() {
        Armed armed;
        loader.UnloadAll();
    }
    void* load_library(const char* file, unsigned char throw_on_failure) KEL_NO_THREAD_SAFETY_ANALYSIS {
        Armed armed;
        return loader._loadLibrary(file, throw_on_failure);
    }
    void unload_unlocked(const char* file) KEL_NO_THREAD_SAFETY_ANALYSIS {
        Armed armed;
        loader._unload(file);
    }
    void close_library(void* handle) KEL_NO_THREAD_SAFETY_ANALYSIS {
        Armed armed;
        loader._closeLibrary(handle);
    }

    std::set<std::string> available;
    bool all_available = false;
    std::vector<std::string> tried, closed;
    std::set<int> modes;
    std::set<std::string*> opened;
    char text[64] = "cannot open shared object file";
    char* problem = text;
    int close_result = 0;
    KELLoadLibrary loader;
};

}  // namespace test
}  // namespace kel

#endif
