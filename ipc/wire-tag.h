// The tags of the wire, known to every client: never renumbered.
#pragma once

#include <cstddef>
#include <cstdint>

enum WireTag : uint8_t {
    TAG_NULL = 0x00,
    TAG_INTEGER = 0x01,
    TAG_STRING = 0x10,
    TAG_BINARY = 0x30,
    TAG_END = 0x40,
    TAG_ARRAY = 0x41,
    TAG_MAP = 0x42,
};

constexpr size_t kMaxIntegerBytes = 8;

// What PStream returns for bytes that are no value, and for a value that cannot be sent.
constexpr int kBadWire = -5;
constexpr int kCannotSend = -1;
