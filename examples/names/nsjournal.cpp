// libnsjournal_r.so: a journal in a file, one framed request for each change.
//
// SPDX-License-Identifier: MIT
#include <fcntl.h>
#include <kel/exceptions/standard.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <sstream>

#include "journal.h"

namespace names {

namespace {

[[noreturn]] void give_up(int error, const char* reason) {
    throw CORBA_PERSIST_STORE(static_cast<std::uint32_t>(error), CORBA::COMPLETED_NO, reason);
}

class FileJournal : public Journal {
public:
    explicit FileJournal(const char* file) : _fd(open(file, O_RDWR | O_CREAT | O_APPEND | O_CLOEXEC, 0600)) {
        if (_fd < 0) give_up(errno, "the journal cannot be opened");
    }
    ~FileJournal() override { close(_fd); }

    void restore(const std::function<void(const Request&)>& apply) override {
        FrameReader records;
        off_t complete = 0;
        char buffer[64 * 1024];
        for (;;) {
            const ssize_t n = read(_fd, buffer, sizeof buffer);
            if (n < 0) give_up(errno, "the journal cannot be read");
            if (n == 0) break;
            records.append(buffer, static_cast<std::size_t>(n));
            std::string text;
            while (records.next(text)) {
                apply(read_request(text));
                complete += static_cast<off_t>(framed(text).size());
            }
        }
        cut_at(complete);
    }

    void record(const Request& change) override {
        std::ostringstream text;
        KELostream out(text);
        write(out, change);
        const std::string bytes = framed(text.str());
        const off_t end = lseek(_fd, 0, SEEK_END);
        const ssize_t n = ::write(_fd, bytes.data(), bytes.size());
        if (n == static_cast<ssize_t>(bytes.size())) return;
        const int error = n < 0 ? errno : ENOSPC;
        cut_at(end);
        give_up(error, "the journal cannot be written");
    }

private:
    // A record that is not there completely would make the ones behind it unreadable.
    void cut_at(off_t end) {
        if (ftruncate(_fd, end) != 0) give_up(errno, "the journal cannot be cut");
    }

    const int _fd;
};

std::unique_ptr<Journal> open_file(const char* file) { return std::make_unique<FileJournal>(file); }

const bool offered = (offer_journal(open_file), true);

}  // namespace

}  // namespace names
