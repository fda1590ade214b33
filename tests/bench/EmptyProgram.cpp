// The peer of whole-process figures: a C++ program, dynamically linked, that does nothing, or sleeps when
// told how long.

#include <chrono>
#include <string>
#include <thread>

int main(int argc, char** argv) {
    if (argc > 1) {
        std::this_thread::sleep_for(std::chrono::seconds(std::stoi(argv[1])));
    }
    return 0;
}
