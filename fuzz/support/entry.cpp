#include <cstddef>
#include <cstdint>

#include "support/fuzz.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size);
extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size)
{
    Fuzz(std::string(data, data + size));
    return 0;
}
