#include <cstddef>
#include <cstdint>

#include "fuzz/Target.h"

// The name by which libFuzzer calls a target.
extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    fuzz::run({reinterpret_cast<const char*>(data), size});
    return 0;
}
