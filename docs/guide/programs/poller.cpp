// SPDX-License-Identifier: MIT
#include <kel/os/pipe.h>
#include <kel/os/poll.h>

#include <iostream>
#include <memory>

struct Line {
    const char* name;
    KELPipe pipe;
};

int main() {
    Line lines[] = {{"first", {}}, {"second", {}}};

    std::unique_ptr<KELPoll> poller(KELPoll::create(2, KELPoll::_defaultAPI));
    for (Line& line : lines) poller->add(line.pipe._read_fd, KELPoll::evMaskRead, &line);
    std::cout << poller->waitForEvents(0) << " ready\n";  // milliseconds: look and do not wait

    lines[1].pipe.write("x", 1);
    int left = poller->waitForEvents(1000);
    std::cout << left << " ready\n";
    for (int i = 0; left > 0 && i < poller->count(); ++i) {
        if (poller->reportedEvent(i) == 0) continue;
        --left;
        std::cout << static_cast<Line*>(poller->userData(i))->name << " can be read\n";
    }

    // Removing may move the other entries: go by the descriptor, not by an index kept from before.
    poller->remove(lines[0].pipe._read_fd);
    std::cout << poller->count() << " watched\n";
}
