// Every standard system exception behaves alike: the tests run over the list of all of them.
// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>
#include <kel/exceptions/standard.h>

#include <string>
#include <type_traits>
#include <typeinfo>
#include <vector>

namespace {

using CORBA::COMPLETED_MAYBE;
using CORBA::COMPLETED_NO;
using CORBA::COMPLETED_YES;

// One standard exception as data, so that a test needs no type.
struct Standard {
    const char* name;
    const std::type_info* type;
    CORBA_Exception::Description* description;
    CORBA_Exception* (*factory)();
    KELStdException* (*make)();
    KELStdException* (*make_with_code)(unsigned long, CORBA::CompletionStatus);
    KELStdException* (*make_with_reason)(unsigned long, CORBA::CompletionStatus, const char*);
    CORBA_Exception* (*downcast)(CORBA_Exception*);
    const CORBA_Exception* (*const_downcast)(const CORBA_Exception*);
    CORBA_Exception::Description* (*type_code)(const CORBA_TypeCode*);
    KELStdException* (*catch_raised)(const CORBA_Exception&);  // a copy of what a handler for it caught
    bool alias;                                                // CORBA::X is CORBA_X
};

template <class X, class Alias>
Standard standard(const char* name) {
    Standard s;
    s.name = name;
    s.type = &typeid(X);
    s.description = &X::_description;
    s.factory = &X::_factory;
    s.make = []() -> KELStdException* { return new X; };
    s.make_with_code = [](unsigned long minor, CORBA::CompletionStatus completed) -> KELStdException* {
        return new X(minor, completed);
    };
    s.make_with_reason = [](unsigned long minor, CORBA::CompletionStatus completed,
                            const char* reason) -> KELStdException* {
        return new X(minor, completed, reason);
    };
    s.downcast = [](CORBA_Exception* e) -> CORBA_Exception* { return X::_downcast(e); };
    s.const_downcast = [](const CORBA_Exception* e) -> const CORBA_Exception* { return X::_downcast(e); };
    s.type_code = &X::_typeCode;
    s.catch_raised = [](const CORBA_Exception& e) -> KELStdException* {
        try {
            e._raise();
        } catch (const X& raised) {
            return typeid(raised) == typeid(X) ? new X(raised) : nullptr;
        }
        return nullptr;
    };
    s.alias = std::is_same<X, Alias>::value;
    return s;
}

const std::vector<Standard>& all_standard() {
    static const std::vector<Standard> all = {
#define KEL_STANDARD_EXCEPTION(X) standard<CORBA_##X, CORBA::X>(#X),
#include <kel/exceptions/standard.inc>
#undef KEL_STANDARD_EXCEPTION
    };
    return all;
}

std::ostream& operator<<(std::ostream& os, const Standard& s) { return os << s.name; }

// ---- the list ----

TEST(StandardExceptions, AreThirtySixInTheOrderOfTheirConstruction) {
    const char* const names[] = {"UNKNOWN",
                                 "BAD_PARAM",
                                 "NO_MEMORY",
                                 "IMP_LIMIT",
                                 "COMM_FAILURE",
                                 "INV_OBJREF",
                                 "NO_PERMISSION",
                                 "INTERNAL",
                                 "MARSHAL",
                                 "INITIALIZE",
                                 "NO_IMPLEMENT",
                                 "BAD_TYPECODE",
                                 "BAD_OPERATION",
                                 "NO_RESOURCES",
                                 "NO_RESPONSE",
                                 "PERSIST_STORE",
                                 "BAD_INV_ORDER",
                                 "TRANSIENT",
                                 "FREE_MEM",
                                 "INV_IDENT",
                                 "INV_FLAG",
                                 "INTF_REPOS",
                                 "BAD_CONTEXT",
                                 "OBJ_ADAPTER",
                                 "DATA_CONVERSION",
                                 "OBJECT_NOT_EXIST",
                                 "TRANSACTION_REQUIRED",
                                 "TRANSACTION_ROLLEDBACK",
                                 "INVALID_TRANSACTION",
                                 "TRANSACTION_UNAVAILABLE",
                                 "TRANSACTION_MODE",
                                 "BAD_QOS",
                                 "INV_POLICY",
                                 "REBIND",
                                 "TIMEOUT",
                                 "CODESET_INCOMPATIBLE"};
    ASSERT_EQ(all_standard().size(), 36u);
    for (std::size_t i = 0; i < 36; ++i) EXPECT_STREQ(all_standard()[i].name, names[i]);
}

TEST(StandardExceptions, HaveDistinctDescriptions) {
    for (const Standard& a : all_standard()) {
        for (const Standard& b : all_standard()) {
            EXPECT_EQ(a.description->can_cast(*b.description), &a == &b) << a.name << " and " << b.name;
        }
    }
}

// ---- each of them ----

class StandardException : public testing::TestWithParam<Standard> {
protected:
    const Standard& x() const { return GetParam(); }

    static const std::type_info& type_of(const CORBA_Exception& e) { return typeid(e); }

    // An exception of the class with everything set.
    KELStdException* full() const { return x().make_with_reason(0x1234, COMPLETED_MAYBE, "because"); }

    static const CORBA_SystemException& system_part(const CORBA_Exception_var& e) {
        return *CORBA_SystemException::_downcast(e.in());
    }
};

TEST_P(StandardException, IsNamedByItsDescription) {
    EXPECT_EQ(x().description->name(), std::string("CORBA::") + x().name);
}

TEST_P(StandardException, HasTheRepositoryIdOfTheOmg) {
    EXPECT_EQ(x().description->repository_id(), std::string("IDL:omg.org/CORBA/") + x().name + ":1.0");
}

TEST_P(StandardException, IsDescribedWithItsFactory) { EXPECT_EQ(x().description->factory(), x().factory); }

TEST_P(StandardException, DerivesFromTheSystemException) {
    EXPECT_EQ(x().description->base(), &CORBA_SystemException::_description);
}

TEST_P(StandardException, IsRegisteredUnderItsId) {
    EXPECT_EQ(CORBA_Exception::Description::desc(x().description->repository_id()), x().description);
}

TEST_P(StandardException, HasAnAliasInTheNamespace) { EXPECT_TRUE(x().alias); }

TEST_P(StandardException, DefaultIsMinorCodeZeroOfTheOmgAndNotCompleted) {
    CORBA_Exception_var e(x().make());
    EXPECT_EQ(system_part(e).minor(), 0x4f4d0000u);
    EXPECT_EQ(system_part(e).completed(), COMPLETED_NO);
    EXPECT_STREQ(system_part(e).reason(), "");
}

TEST_P(StandardException, TakesMinorCodeAndStatus) {
    CORBA_Exception_var e(x().make_with_code(5, COMPLETED_YES));
    EXPECT_EQ(system_part(e).minor(), 0x4f4d0005u);
    EXPECT_EQ(system_part(e).completed(), COMPLETED_YES);
    EXPECT_STREQ(system_part(e).reason(), "");
}

TEST_P(StandardException, TakesMinorCodeStatusAndExplanation) {
    CORBA_Exception_var e(full());
    EXPECT_EQ(system_part(e).minor(), 0x1234u);
    EXPECT_EQ(system_part(e).completed(), COMPLETED_MAYBE);
    EXPECT_STREQ(system_part(e).reason(), "because");
}

TEST_P(StandardException, AnswersWithItsOwnDescription) {
    CORBA_Exception_var e(x().make());
    EXPECT_EQ(e->_desc(), x().description);
    EXPECT_EQ(e->_name(), x().description->name());
    EXPECT_EQ(e->_repository_id(), x().description->repository_id());
}

TEST_P(StandardException, FactoryMakesADefaultInstance) {
    CORBA_Exception_var e(x().factory());
    EXPECT_EQ(type_of(*e.in()), *x().type);
    EXPECT_EQ(system_part(e).minor(), 0x4f4d0000u);
    EXPECT_EQ(system_part(e).completed(), COMPLETED_NO);
}

TEST_P(StandardException, RaiseThrowsACopyOfItsOwnClass) {
    CORBA_Exception_var e(full());
    CORBA_Exception_var raised(x().catch_raised(*e.in()));
    ASSERT_NE(raised.in(), nullptr);
    EXPECT_EQ(system_part(raised).minor(), 0x1234u);
    EXPECT_EQ(system_part(raised).completed(), COMPLETED_MAYBE);
    EXPECT_STREQ(system_part(raised).reason(), "because");
    EXPECT_EQ(raised->_desc(), x().description);
}

TEST_P(StandardException, RaisedCopyKeepsTheFactory) {
    CORBA_Exception_var e(full());
    CORBA_Exception_var raised(x().catch_raised(*e.in()));
    ASSERT_NE(raised.in(), nullptr);
    CORBA_Exception_var copy(raised->_deep_copy());
    EXPECT_EQ(type_of(*copy.in()), *x().type);
}

TEST_P(StandardException, HandlersForItsBasesCatchIt) {
    CORBA_Exception_var e(full());
    EXPECT_THROW(e->_raise(), KELStdException);
    EXPECT_THROW(e->_raise(), CORBA_SystemException);
    EXPECT_THROW(e->_raise(), CORBA_Exception);
}

TEST_P(StandardException, DeepCopyHasTheConcreteClassAndTheSameContents) {
    CORBA_Exception_var e(full());
    CORBA_Exception_var copy(e->_deep_copy());
    EXPECT_NE(copy.in(), e.in());
    EXPECT_EQ(type_of(*copy.in()), *x().type);
    EXPECT_EQ(system_part(copy).minor(), 0x1234u);
    EXPECT_EQ(system_part(copy).completed(), COMPLETED_MAYBE);
    EXPECT_STREQ(system_part(copy).reason(), "because");
}

TEST_P(StandardException, DowncastGivesTheObject) {
    CORBA_Exception_var e(x().make());
    EXPECT_EQ(x().downcast(e.in()), e.in());
    EXPECT_EQ(x().const_downcast(e.in()), e.in());
}

TEST_P(StandardException, DowncastOfAnotherClassGivesNull) {
    for (const Standard& other : all_standard()) {
        if (other.description == x().description) continue;
        CORBA_Exception_var e(other.make());
        EXPECT_EQ(x().downcast(e.in()), nullptr) << other.name;
        EXPECT_EQ(x().const_downcast(e.in()), nullptr) << other.name;
    }
}

TEST_P(StandardException, DowncastOfNullGivesNull) {
    EXPECT_EQ(x().downcast(nullptr), nullptr);
    EXPECT_EQ(x().const_downcast(nullptr), nullptr);
}

TEST_P(StandardException, HasNoTypeCodeUntilOneIsStored) { EXPECT_EQ(x().description->type_code(), nullptr); }

TEST_P(StandardException, StoredTypeCodeIsSeenThroughLaterLookups) {
    int the_orbs = 0;
    const CORBA_TypeCode* const tc = reinterpret_cast<const CORBA_TypeCode*>(&the_orbs);
    EXPECT_EQ(x().type_code(tc), x().description);
    EXPECT_EQ(CORBA_Exception::Description::desc(x().description->repository_id())->type_code(), tc);
    x().type_code(nullptr);
}

std::string name_of(const testing::TestParamInfo<Standard>& parameter) { return parameter.param.name; }

INSTANTIATE_TEST_SUITE_P(All, StandardException, testing::ValuesIn(all_standard()), name_of);

TEST(StandardExceptions, NullLiteralIsNotAmbiguousForDowncast) {
    EXPECT_EQ(CORBA_BAD_PARAM::_downcast(nullptr), nullptr);
}

}  // namespace
