// SPDX-License-Identifier: MIT
#include <kel/core/thread.h>
#include <kel/os/pipe.h>

#include <iostream>

// Answers what comes along the pipe, on its other channel.
class Echo : public KELThread {
public:
    explicit Echo(KELPipe& pipe) : KELThread(0), _pipe(pipe) {}

    void begin() override {
        char c = 0;
        while (_pipe.read(&c, 1) == 1 && c != '.') {
            c = static_cast<char>(c - 'a' + 'A');
            _pipe.write_to_writer(&c, 1);
        }
        _pipe.write_to_writer(".", 1);
    }

private:
    KELPipe& _pipe;
};

int main() {
    KELPipe pipe;
    Echo echo(pipe);
    echo.run();

    pipe.write("kel.", 4);  // one call of the system: whole, as it is short
    for (char c = 0; pipe.read_from_writer(&c, 1) == 1 && c != '.';) std::cout << c;
    std::cout << "\n";
}
