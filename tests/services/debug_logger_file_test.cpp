// The log file of the debug logger: naming, opening and closing it, and what happens when the system refuses.
//
// SPDX-License-Identifier: MIT
#include <fcntl.h>

#include <cstring>
#include <new>

#include "tests/services/log_folder.h"
#include "tests/support/child.h"

namespace {

using namespace kel::test;

class DebugLogFile : public DebugLoggerTest {};

// --- naming ------------------------------------------------------------------------------------------

TEST_F(DebugLogFile, ANullNameIsRefused) {
    KELDebugLogger fresh;
    EXPECT_EQ(fresh.setLogFile(nullptr), 0);
    EXPECT_EQ(fresh._file_name, nullptr);
    EXPECT_EQ(fresh._pending, 0);
}

TEST_F(DebugLogFile, AnEmptyNameIsRefused) {
    KELDebugLogger fresh;
    EXPECT_EQ(fresh.setLogFile(""), 0);
    EXPECT_EQ(fresh._file_name, nullptr);
    EXPECT_EQ(fresh._pending, 0);
}

TEST_F(DebugLogFile, ASecondNameIsRefused) {
    EXPECT_EQ(log.setLogFile(folder.file("other").c_str()), 0);
    EXPECT_STREQ(log._file_name, path.c_str());
    EXPECT_EQ(log._pending, 1);
}

TEST_F(DebugLogFile, ANameIsCopiedAndMarkedPending) {
    KELDebugLogger fresh;
    std::string name = path;
    EXPECT_EQ(fresh.setLogFile(name.c_str()), 1);
    name[0] = '?';
    EXPECT_STREQ(fresh._file_name, path.c_str());
    EXPECT_EQ(fresh._pending, 1);
}

TEST_F(DebugLogFile, ANameIsCutAfter1024Bytes) {
    KELDebugLogger fresh;
    EXPECT_EQ(fresh.setLogFile(std::string(2000, 'n').c_str()), 1);
    EXPECT_EQ(std::strlen(fresh._file_name), 1024u);
}

TEST_F(DebugLogFile, ANameWithoutMemoryChangesNothing) {
    KELDebugLogger fresh;
    AllocationPlan::fail(1);
    faulted([&] { EXPECT_THROW(fresh.setLogFile(path.c_str()), std::bad_alloc); });
    EXPECT_EQ(fresh._file_name, nullptr);
    EXPECT_EQ(fresh._pending, 0);
    EXPECT_FALSE(is_held(fresh));
}

TEST_F(DebugLogFile, ALoggerOnStandardOutputCanBeGivenAFile) {
    KELDebugLogger fresh;
    fresh.traceModule(module);
    fresh.setLogFile(path.c_str());
    write_line(fresh);
    EXPECT_EQ(headers_in(path), 1);
}

// --- init --------------------------------------------------------------------------------------------

TEST_F(DebugLogFile, InitStartsOverWithTheGivenFlags) {
    log.traceModule(module);
    log.setTrimSize(1);
    write_line(log);
    log.start(3, module, "f", 1);
    log.init(path.c_str(), 6);
    EXPECT_EQ(log._in_line, 0);
    log << endl;
    for (std::uint32_t mask : log._masks) EXPECT_EQ(mask, 0u);
    EXPECT_EQ(log.flag(), 6u);
    EXPECT_EQ(log._trim_size, 1048576u);
    EXPECT_EQ(log._lines, 0);
    EXPECT_EQ(log._fd, -1);
}

TEST_F(DebugLogFile, InitKeepsANameThatIsSet) {
    log.init(folder.file("other").c_str(), 1);
    EXPECT_STREQ(log._file_name, path.c_str());
    EXPECT_EQ(log._pending, 1);
}

TEST_F(DebugLogFile, InitKeepsAnOpenFileOpen) {
    write_line(log);
    std::FILE* const before = log._fp;
    log.init(folder.file("other").c_str(), 1);
    EXPECT_EQ(log._fp, before);
    EXPECT_EQ(log._pending, 0);
    log.traceModule(module);
    write_line(log);
    EXPECT_EQ(headers_in(path), 2);
}

TEST_F(DebugLogFile, InitWithoutAFileTurnsToStandardOutput) {
    log.init(nullptr, 0);
    EXPECT_EQ(log._fp, stdout);
    EXPECT_EQ(log._pending, 0);
}

TEST_F(DebugLogFile, InitWithoutAFileClosesTheOpenOne) {
    write_line(log);
    const int descriptor = log._fd;
    log.init(nullptr, 0);
    EXPECT_EQ(::fcntl(descriptor, F_GETFD), -1);
    log.closeFile();  // standard output is not the log's to close
    EXPECT_EQ(log._fp, stdout);
}

// --- opening -----------------------------------------------------------------------------------------

TEST_F(DebugLogFile, TheFileIsOpenedByTheFirstEnabledStart) {
    EXPECT_FALSE(exists(path));
    log.start(3, other_group, "f", 1) << endl;
    EXPECT_FALSE(exists(path));
    write_line(log);
    EXPECT_TRUE(exists(path));
    EXPECT_EQ(log._pending, 0);
}

TEST_F(DebugLogFile, OpeningAppends) {
    write_text(path, "older\n");
    write_line(log, "newer");
    EXPECT_EQ(text_of(path).find("older\n=> "), 0u);
}

TEST_F(DebugLogFile, TheModeIsAppend) {
    std::string name, mode;
    seams::fopen64.script([&](const char* n, const char* m) {
        name = n;
        mode = m;
        return seams::fopen64.real(n, m);
    });
    faulted([&] { log.openFile(); });
    EXPECT_EQ(name, path);
    EXPECT_EQ(mode, "a");
}

TEST_F(DebugLogFile, OpeningRecordsTheDescriptor) {
    log.openFile();
    EXPECT_NE(log._fd, -1);
    EXPECT_EQ(log._fd, ::fileno(log._fp));
    EXPECT_EQ(log._pending, 0);
}

TEST_F(DebugLogFile, OpeningGivesTheFileMode0666WhateverTheUmask) {
    const mode_t mask = ::umask(0077);
    log.openFile();
    ::umask(mask);
    struct stat st;
    ASSERT_EQ(::stat(path.c_str(), &st), 0);
    EXPECT_EQ(st.st_mode & 07777, 0666u);
}

TEST_F(DebugLogFile, ChildrenInheritTheDescriptor) {
    log.openFile();
    EXPECT_EQ(::fcntl(log._fd, F_GETFD) & FD_CLOEXEC, 0);
}

TEST_F(DebugLogFile, AnOpenFileIsNotOpenedAgain) {
    log.openFile();
    faulted([&] { log.openFile(); });
    EXPECT_EQ(seams::fopen64.calls(), 0);
}

TEST_F(DebugLogFile, AnUnwantedModeChangeIsIgnored) {
    seams::fchmod.fail(1, EPERM);
    faulted([&] { write_line(log); });
    EXPECT_EQ(headers_in(path), 1);
}

TEST_F(DebugLogFile, AFailedOpenLeavesTheFilePending) {
    seams::fopen64.fail(1, EACCES);
    faulted([&] { log.openFile(); });
    EXPECT_EQ(log._fd, -1);
    EXPECT_EQ(log._pending, 1);
}

TEST_F(DebugLogFile, AFailedOpenSuppressesTheLine) {
    seams::fopen64.fail(1, EACCES);
    faulted([&] { write_line(log); });
    EXPECT_FALSE(exists(path));
    EXPECT_EQ(log._in_line, 0);
    EXPECT_EQ(log._lines, 0);
    EXPECT_FALSE(is_held(log));
}

TEST_F(DebugLogFile, AFailedOpenPrintsNowhereElse) {
    const Outcome o = in_child([&] {
        KELDebugLogger switched;
        switched.traceModule(module);
        switched.setLogFile(folder.file("missing/log").c_str());
        write_line(switched);
    });
    EXPECT_EQ(o.out + o.err, "");
}

TEST_F(DebugLogFile, TheNextStartAfterAFailedOpenTriesAgain) {
    seams::fopen64.fail(1, EACCES);
    faulted([&] {
        write_line(log, "lost");
        write_line(log, "kept");
    });
    EXPECT_EQ(headers_in(path), 1);
    EXPECT_NE(text_of(path).find("kept"), std::string::npos);
}

// --- closing -----------------------------------------------------------------------------------------

TEST_F(DebugLogFile, ClosingMarksTheFilePendingAgain) {
    write_line(log);
    const int descriptor = log._fd;
    log.closeFile();
    EXPECT_EQ(log._pending, 1);
    EXPECT_EQ(log._fd, -1);
    EXPECT_EQ(::fcntl(descriptor, F_GETFD), -1);
}

TEST_F(DebugLogFile, TheNextStartReopensAClosedFile) {
    write_line(log);
    log.closeFile();
    write_line(log);
    EXPECT_EQ(headers_in(path), 2);
}

TEST_F(DebugLogFile, ClosingAPendingFileDoesNothing) {
    faulted([&] { log.closeFile(); });
    EXPECT_EQ(seams::fclose.calls(), 0);
    EXPECT_EQ(log._pending, 1);
}

TEST_F(DebugLogFile, ClosingLeavesStandardOutputOpen) {
    KELDebugLogger plain;
    faulted([&] { plain.closeFile(); });
    EXPECT_EQ(seams::fclose.calls(), 0);
    EXPECT_EQ(plain._pending, 0);
    EXPECT_EQ(plain._fp, stdout);
}

TEST_F(DebugLogFile, AFailedFlushOnClosingChangesNothing) {
    write_line(log);
    std::FILE* const stream = log._fp;
    const int descriptor = log._fd;
    seams::fflush.fail(1, ENOSPC);
    faulted([&] { log.closeFile(); });
    EXPECT_EQ(seams::fclose.calls(), 0);
    EXPECT_EQ(log._fp, stream);
    EXPECT_EQ(log._fd, descriptor);
    EXPECT_EQ(log._pending, 0);
    write_line(log);
    EXPECT_EQ(headers_in(path), 2);
}

TEST_F(DebugLogFile, AFailedCloseChangesNothing) {
    write_line(log);
    const int descriptor = log._fd;
    ::close(descriptor);
    log.closeFile();
    EXPECT_EQ(log._fd, descriptor);
    EXPECT_EQ(log._pending, 0);
}

TEST_F(DebugLogFile, AFileLostByAFailedCloseIsOpenedAgain) {
    write_line(log);
    ::close(log._fd);
    log.closeFile();
    write_line(log);
    EXPECT_EQ(headers_in(path), 2);
    EXPECT_EQ(log._fd, ::fileno(log._fp));
}

TEST_F(DebugLogFile, AFileLostByAFailedCloseStaysPendingWhileItCannotBeOpened) {
    write_line(log);
    ::close(log._fd);
    log.closeFile();
    seams::fopen64.fail(1, EACCES);
    faulted([&] { write_line(log); });
    EXPECT_EQ(log._pending, 1);
    EXPECT_EQ(log._fd, -1);
    write_line(log);
    EXPECT_EQ(headers_in(path), 2);
}

TEST_F(DebugLogFile, ALineClosedInItsMiddleLosesItsRest) {
    log.start(3, module, "f", 1) << "first";
    log.closeFile();
    log << "lost" << 1L << endl;
    write_line(log, "next");
    const std::string text = text_of(path);
    EXPECT_NE(text.find("\nfirst=> "), std::string::npos);
    EXPECT_EQ(text.find("lost"), std::string::npos);
}

TEST_F(DebugLogFile, TheDestructorClosesTheFile) {
    KELDebugLogger* const doomed = new KELDebugLogger(folder.file("doomed").c_str());
    doomed->openFile();
    const int descriptor = doomed->_fd;
    delete doomed;
    EXPECT_EQ(::fcntl(descriptor, F_GETFD), -1);
}

TEST_F(DebugLogFile, TheDestructorFreesTheName) {
    const long before = AllocationPlan::live_blocks();
    { KELDebugLogger doomed("name"); }
    EXPECT_EQ(AllocationPlan::live_blocks(), before);
}

TEST_F(DebugLogFile, WriteErrorsAreSilent) {
    const Outcome o = in_child([] {
        KELDebugLogger full("/dev/full");
        full.traceModule(module);
        write_lines(full, 3);
    });
    EXPECT_EQ(o.exit_code, 0);
    EXPECT_EQ(o.out + o.err, "");
}

}  // namespace
