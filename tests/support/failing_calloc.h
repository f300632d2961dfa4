// Makes calloc fail.
//
//   FailingCalloc    while one lives, one armed call of calloc finds no memory
//
//     const FailingCalloc second(2);
//     { Armed armed; EXPECT_THROW(Getaddrinfo(nullptr, 80, SOCK_STREAM, 1), std::bad_alloc); }
//     EXPECT_EQ(second.calls(), 2);
//
// Apart from the seams, because calloc is called before the dynamic linker can look anything up, and
// because sanitizers bring their own. One lives at a time.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_SUPPORT_FAILING_CALLOC_H
#define KEL_TESTS_SUPPORT_FAILING_CALLOC_H

namespace kel {
namespace test {

class FailingCalloc {
public:
    // The `nth` armed call from now on fails; the first is 1.
    explicit FailingCalloc(long nth);
    ~FailingCalloc();
    FailingCalloc(const FailingCalloc&) = delete;
    FailingCalloc& operator=(const FailingCalloc&) = delete;

    // Armed calls so far.
    long calls() const;
};

}  // namespace test
}  // namespace kel

#endif
