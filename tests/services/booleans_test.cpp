// The types of truth values. Clients were compiled for them, and an unsigned char is returned in a
// register of which a bool reads one bit.
//
// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>
#include <kel/kel.h>

#include <type_traits>
#include <utility>

namespace {

template <class T>
T& some();

template <class T>
constexpr bool is_byte = std::is_same<T, unsigned char>::value;

template <class T>
constexpr bool is_bool = std::is_same<T, bool>::value;

typedef KELDictionary<KELUniqueId, int> Table;

TEST(Booleans, AreUnsignedChars) {
    EXPECT_TRUE(is_byte<decltype(KELMutex_var::_locked)>);
    EXPECT_TRUE(is_byte<decltype(KELDMutex_var::_locked)>);
    EXPECT_TRUE(is_byte<decltype(some<KELCondition>().timedwait(some<KELMutex>(), 1ul))>);
    EXPECT_TRUE(is_byte<decltype(some<KELCondition>().timedwait(some<KELMutex>(), 1ull))>);
    EXPECT_TRUE(is_byte<decltype(KELResourceImpl::_init_sharing)>);
    EXPECT_TRUE(is_byte<decltype(some<Table>().addIfNotExist(KELUniqueId(1), 1))>);
    EXPECT_TRUE(is_byte<decltype(some<Table>().atKey(KELUniqueId(1), some<int>()))>);
    EXPECT_TRUE(is_byte<decltype(some<Table>().removeKeyIfExists(KELUniqueId(1)))>);
    EXPECT_TRUE(is_byte<decltype(CORBA_String_var::_allowing_null_string)>);
    EXPECT_TRUE(is_byte<decltype(some<KEListream>().istrm_is_null())>);
    EXPECT_TRUE(is_byte<decltype(some<KEListream>().is_available(1))>);
    EXPECT_TRUE(is_byte<decltype(some<KELArgList>().getArg(""))>);
    EXPECT_TRUE(is_byte<decltype(KELLoadLibrary::_inited)>);
    EXPECT_TRUE(is_byte<decltype(some<KELDebugLogger>().setLogFile(""))>);
    EXPECT_TRUE(is_byte<decltype(some<KELDebugLogger>().isTraceEnabledFor(1))>);
    EXPECT_TRUE(is_byte<decltype(CORBA::is_nil(static_cast<CORBA_Environment*>(nullptr)))>);
}

TEST(Booleans, ArePassedAsUnsignedChars) {
    EXPECT_TRUE(
        (std::is_same<decltype(&Getaddrinfo), addrinfo* (*)(const char*, int, int, unsigned char)>::value));
    EXPECT_TRUE((std::is_same<decltype(&KELPortable::socketError), void (*)(int, unsigned char)>::value));
    EXPECT_TRUE((std::is_same<decltype(&KELResource::set_init_sharing), void (*)(unsigned char)>::value));
}

TEST(Booleans, AreBoolWhereTheInterfaceSaysSo) {
    EXPECT_TRUE(
        is_bool<decltype(some<CORBA_Exception::Description>().can_cast(CORBA_Exception::_description))>);
    EXPECT_TRUE(is_bool<decltype(some<KELPoll>().fdIsSet(1))>);
    EXPECT_TRUE(is_bool<decltype(KELPortable::max_fd_reached(1))>);
    EXPECT_TRUE(is_bool<decltype(KELPortable::get_sysversion(some<KELSysVersion>()))>);
    EXPECT_TRUE(is_bool<decltype(KELPortable::vFileExists(""))>);
    EXPECT_TRUE(is_bool<decltype(KELPortable::vwhence("", some<char*>()))>);
    EXPECT_TRUE(is_bool<decltype(KELPortable::ipAddr(2, some<void*>(), ""))>);
    EXPECT_TRUE(is_bool<decltype(KELPortable::isLocal(""))>);
    EXPECT_TRUE(is_bool<decltype(KELPortable::isValidIP(2, ""))>);
    EXPECT_TRUE(is_bool<decltype(KELPortable::saIsLoopback(some<sockaddr*>()))>);
    EXPECT_TRUE(is_bool<decltype(some<KELThreadId>() == some<KELThreadId>())>);
}

}  // namespace
