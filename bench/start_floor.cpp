// The least a program built as hadrocli is built pays to start: linked against the shared
// C++ library, it writes one line through iostreams and ends.
#include <iostream>

int main() {
    std::cout << "started\n";
    return 0;
}
