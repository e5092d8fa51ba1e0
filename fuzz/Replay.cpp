// Runs one target over every file of a folder: how ordinary builds test the inputs that are kept.

#include <cstdio>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

#include "fuzz/Target.h"

namespace {

// On the heap and of exactly the file's size, so that a sanitizer sees each byte read beyond it.
std::vector<char> contentOf(const std::filesystem::path& file) {
    std::ifstream stream(file, std::ios::binary);
    const std::string text(std::istreambuf_iterator<char>(stream), {});
    fuzz::require(!stream.bad(), "a file of the corpus is read");
    return {text.begin(), text.end()};
}

} // namespace

int main(int count, char** arguments) {
    fuzz::require(count == 2, "the folder is given as the only argument");
    std::size_t inputs = 0;
    for (const auto& file : std::filesystem::directory_iterator(arguments[1])) {
        std::printf("%s\n", file.path().filename().c_str());
        std::fflush(stdout); // so that the last name is that of a finding
        const std::vector<char> input = contentOf(file);
        fuzz::run({input.data(), input.size()});
        ++inputs;
    }
    fuzz::require(inputs != 0, "the folder has inputs");
}
