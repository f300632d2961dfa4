// The rotation of the debug logger's file, and what happens when the system refuses.
//
// SPDX-License-Identifier: MIT
#include "tests/services/log_folder.h"

namespace {

using namespace kel::test;

class DebugLogTrimming : public DebugLoggerTest {
protected:
    // A name in this folder that is `length` bytes long; its folders exist.
    std::string long_name(std::size_t length) {
        std::string name = folder.file("");
        while (length - name.size() > 200) {
            name += std::string(100, 'd');
            ::mkdir(name.c_str(), 0700);
            name += "/";
        }
        return name + std::string(length - name.size(), 'n');
    }

    // A log of exactly `size` bytes, open, with a limit of 1 KiB.
    void open_log_of(int size) {
        write_text(path, std::string(size, 'x'));
        log.openFile();
        log.setTrimSize(1);
    }
};

TEST_F(DebugLogTrimming, ALogBelowTheLimitStays) {
    open_log_of(1023);
    log.trimLog();
    EXPECT_FALSE(exists(backup));
    EXPECT_EQ(text_of(path).size(), 1023u);
}

TEST_F(DebugLogTrimming, ALogAtTheLimitIsRenamedAndANewOneStarts) {
    open_log_of(1024);
    log.trimLog();
    EXPECT_EQ(text_of(backup), std::string(1024, 'x'));
    EXPECT_EQ(text_of(path), "");
    EXPECT_EQ(log._pending, 0);
    EXPECT_EQ(log._fd, ::fileno(log._fp));
}

TEST_F(DebugLogTrimming, TheOlderBackupIsReplaced) {
    write_text(backup, "older");
    open_log_of(2000);
    log.trimLog();
    EXPECT_EQ(text_of(backup), std::string(2000, 'x'));
}

TEST_F(DebugLogTrimming, TheOlderBackupIsDeletedBeforeTheRename) {
    open_log_of(2000);
    std::string deleted, from, to;
    seams::unlink.script([&](const char* name) {
        EXPECT_EQ(from, "");
        deleted = name;
        return seams::unlink.real(name);
    });
    seams::rename.script([&](const char* a, const char* b) {
        from = a;
        to = b;
        return seams::rename.real(a, b);
    });
    faulted([&] { log.trimLog(); });
    EXPECT_EQ(deleted, backup);
    EXPECT_EQ(from, path);
    EXPECT_EQ(to, backup);
}

TEST_F(DebugLogTrimming, NothingIsTrimmedWithoutTheFlag) {
    open_log_of(2000);
    log.unsetFlag(1);
    log.trimLog();
    EXPECT_FALSE(exists(backup));
}

TEST_F(DebugLogTrimming, NothingIsTrimmedWhileNoFileIsOpen) {
    write_text(path, std::string(2000, 'x'));
    log.setTrimSize(1);
    log.trimLog();
    EXPECT_FALSE(exists(backup));
    EXPECT_EQ(log._pending, 1);
}

TEST_F(DebugLogTrimming, StandardOutputIsNotTrimmed) {
    KELDebugLogger plain;
    plain.setFlag(1);
    faulted([&] { plain.trimLog(); });
    EXPECT_EQ(seams::fstat64.calls(), 0);
}

TEST_F(DebugLogTrimming, TheDefaultLimitIsOneMebibyte) {
    write_text(path, std::string(1048575, 'x'));
    log.openFile();
    log.trimLog();
    EXPECT_FALSE(exists(backup));
    std::fputc('x', log._fp);
    std::fflush(log._fp);
    log.trimLog();
    EXPECT_TRUE(exists(backup));
}

TEST_F(DebugLogTrimming, ASizeThatCannotBeReadLeavesTheLog) {
    open_log_of(2000);
    seams::fstat64.fail(1, EIO);
    faulted([&] { log.trimLog(); });
    EXPECT_FALSE(exists(backup));
    EXPECT_EQ(log._pending, 0);
}

TEST_F(DebugLogTrimming, ABackupThatCannotBeDeletedIsOverwritten) {
    write_text(backup, "older");
    open_log_of(2000);
    seams::unlink.fail(1, EACCES);
    faulted([&] { log.trimLog(); });
    EXPECT_EQ(text_of(backup), std::string(2000, 'x'));
}

TEST_F(DebugLogTrimming, ALogThatCannotBeClosedKeepsItsName) {
    open_log_of(2000);
    seams::fflush.fail(1, ENOSPC);
    faulted([&] { log.trimLog(); });
    EXPECT_FALSE(exists(backup));
    write_line(log);
    EXPECT_EQ(headers_in(path), 1);
}

TEST_F(DebugLogTrimming, ALogThatCannotBeRenamedGoesOn) {
    open_log_of(2000);
    seams::rename.fail(1, EACCES);
    faulted([&] { log.trimLog(); });
    EXPECT_EQ(log._pending, 0);
    write_line(log);
    EXPECT_EQ(headers_in(path), 1);
    EXPECT_EQ(text_of(path).substr(0, 2000), std::string(2000, 'x'));
}

TEST_F(DebugLogTrimming, ANewLogThatCannotBeOpenedStaysPending) {
    open_log_of(2000);
    seams::fopen64.fail(1, EMFILE);
    faulted([&] { log.trimLog(); });
    EXPECT_TRUE(exists(backup));
    EXPECT_EQ(log._pending, 1);
    write_line(log);
    EXPECT_EQ(headers_in(path), 1);
}

TEST_F(DebugLogTrimming, ABackupNameOf1024BytesIsUsed) {
    const std::string name = long_name(1023);
    KELDebugLogger deep(name.c_str());
    write_text(name, std::string(1024, 'x'));
    deep.setTrimSize(1);
    deep.openFile();
    deep.trimLog();
    EXPECT_EQ(text_of(name + "o").size(), 1024u);
    EXPECT_EQ(text_of(name), "");
}

TEST_F(DebugLogTrimming, ABackupNameBeyond1024BytesIsNotCutToAnotherFile) {
    const std::string name = long_name(1024);
    KELDebugLogger deep(name.c_str());
    write_text(name, std::string(1024, 'x'));
    deep.setTrimSize(1);
    deep.openFile();
    faulted([&] { deep.trimLog(); });
    EXPECT_EQ(seams::unlink.calls(), 0);
    EXPECT_EQ(seams::rename.calls(), 0);
    EXPECT_EQ(text_of(name).size(), 1024u);
    EXPECT_EQ(deep._pending, 0);
}

TEST_F(DebugLogTrimming, TheSizeIsLookedAtEveryFiveHundredHeaders) {
    faulted([&] { write_lines(log, 499); });
    EXPECT_EQ(seams::fstat64.calls(), 0);
    EXPECT_EQ(log._lines, 499);
    faulted([&] { write_line(log); });
    EXPECT_EQ(seams::fstat64.calls(), 1);
    EXPECT_EQ(log._lines, 0);
    faulted([&] { write_lines(log, 500); });
    EXPECT_EQ(seams::fstat64.calls(), 2);
}

TEST_F(DebugLogTrimming, TheFiveHundredthStartTrimsBeforeItsHeader) {
    log.setTrimSize(1);
    write_lines(log, 500);
    EXPECT_EQ(headers_in(backup), 499);
    EXPECT_EQ(headers_in(path), 1);
}

TEST_F(DebugLogTrimming, LaterRotationsHoldFiveHundredEntries) {
    log.setTrimSize(1);
    write_lines(log, 1000);
    EXPECT_EQ(headers_in(backup), 500);
    EXPECT_EQ(headers_in(path), 1);
}

TEST_F(DebugLogTrimming, TheCountStartsOverEvenWhenNothingIsTrimmed) {
    write_lines(log, 500);
    EXPECT_FALSE(exists(backup));
    EXPECT_EQ(log._lines, 0);
    EXPECT_EQ(headers_in(path), 500);
}

TEST_F(DebugLogTrimming, StartsWithoutAHeaderAreNotCounted) {
    write_line(log);
    log.start(3, other_group, "f", 1) << endl;
    log.start(3, module, "f", 1);
    log.start(3, module, "f", 1);
    log << endl << endl;
    EXPECT_EQ(log._lines, 2);
}

TEST_F(DebugLogTrimming, AFailedRenameIsTriedAgainFiveHundredHeadersLater) {
    log.setTrimSize(1);
    seams::rename.fail(1, EACCES);
    faulted([&] { write_lines(log, 999); });
    EXPECT_FALSE(exists(backup));
    faulted([&] { write_line(log); });
    EXPECT_EQ(headers_in(backup), 999);
}

TEST_F(DebugLogTrimming, AStartWhoseNewLogCannotBeOpenedPrintsNothing) {
    log.setTrimSize(1);
    write_lines(log, 499);
    seams::fopen64.fail(1, EMFILE);
    faulted([&] { write_line(log, "lost"); });
    EXPECT_FALSE(exists(path));
    EXPECT_EQ(headers_in(backup), 499);
    EXPECT_FALSE(is_held(log));
    write_line(log, "kept");
    EXPECT_EQ(headers_in(path), 1);
}

TEST_F(DebugLogTrimming, FileOperationsLeaveTheLockFree) {
    log.openFile();
    log.trimLog();
    log.closeFile();
    log.init(nullptr, 1);
    EXPECT_FALSE(is_held(log));
}

TEST_F(DebugLogTrimming, FileOperationsHoldTheLock) {
    open_log_of(2000);
    pthread_mutex_t* const lock = inside(log);
    int held = 0;
    seams::fstat64.script([&](int fd, struct stat64* st) {
        held += is_held(lock);
        return seams::fstat64.real(fd, st);
    });
    seams::fclose.script([&](FILE* file) {
        held += is_held(lock);
        return seams::fclose.real(file);
    });
    seams::fopen64.script([&](const char* name, const char* mode) {
        held += is_held(lock);
        return seams::fopen64.real(name, mode);
    });
    faulted([&] {
        log.trimLog();
        log.closeFile();
        log.openFile();
    });
    EXPECT_EQ(held, 5);
}

}  // namespace
