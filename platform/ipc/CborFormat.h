#pragma once

#include <cstdint>

namespace platform::ipc::cbor {

// The parts of RFC 8949 that the wire uses.

enum class Major : std::uint8_t {
    unsignedInteger = 0,
    negativeInteger = 1,
    bytes = 2,
    text = 3,
    array = 4,
    map = 5,
    tag = 6,
    simple = 7,
};

// How the argument of an item's head is written: itself, or in the 1, 2, 4 or 8 bytes after it.
inline constexpr std::uint8_t firstLongArgument = 24;
inline constexpr std::uint8_t lastLongArgument = 27;

inline constexpr std::uint8_t falseByte = 0xf4;
inline constexpr std::uint8_t trueByte = 0xf5;
inline constexpr std::uint8_t nullByte = 0xf6;
inline constexpr std::uint8_t float16Byte = 0xf9;
inline constexpr std::uint8_t float32Byte = 0xfa;
inline constexpr std::uint8_t float64Byte = 0xfb;

inline constexpr std::uint64_t tagDate = 1;
inline constexpr std::uint64_t tagEncoded = 24;
inline constexpr std::uint64_t tagUrl = 32;
inline constexpr std::uint64_t tagUuid = 37;

} // namespace platform::ipc::cbor
