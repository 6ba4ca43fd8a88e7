// Names, each stored once, in a few large blocks: what the lists of one scan point to.
//
// A name is bytes without NUL. The texts stay where they are until the pool is destroyed.
// Threads: a pool belongs to one thread.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string_view>
#include <vector>

class NamePool {
public:
    static constexpr size_t FIRST_BLOCK_BYTES = 512;
    static constexpr size_t MAX_BLOCKS = 32;

    // A test of a full pool may ask for fewer blocks.
    explicit NamePool(size_t max_blocks = MAX_BLOCKS);
    NamePool(const NamePool&) = delete;
    NamePool& operator=(const NamePool&) = delete;

    // Stores the name unless it is there; `out` is then its one address, with a NUL at the end.
    // 0; -1 when all blocks are in use and none has room, when there is no memory for another one,
    // and for a name with a NUL.
    [[nodiscard]] int Add(std::string_view name, const char** out);
    // The address of a stored name, or null.
    [[nodiscard]] const char* Find(std::string_view name) const;

    // False once a name was refused because there was no room or no memory for it.
    [[nodiscard]] bool HasRoom() const { return m_has_room; }
    [[nodiscard]] size_t Size() const { return m_count; }
    [[nodiscard]] size_t BlockCount() const { return m_blocks.size(); }

private:
    struct Block {
        std::unique_ptr<char[]> data;
        size_t size;
        size_t used;
    };
    struct Slot {
        const char* name;  // null is free
        uint32_t hash;
        uint32_t length;
    };

    [[nodiscard]] size_t SlotOf(std::string_view name, uint32_t hash) const;
    [[nodiscard]] const char* Store(std::string_view name);
    [[nodiscard]] bool AddBlock(size_t size);
    void Grow();

    size_t m_max_blocks;
    std::vector<Block> m_blocks;
    std::vector<Slot> m_slots;  // open addressing; the size is a power of two
    size_t m_count = 0;
    bool m_has_room = true;
};
