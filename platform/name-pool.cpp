#include "utils/name-pool.h"

#include <algorithm>
#include <cstring>
#include <functional>
#include <new>
#include <utility>

namespace {

constexpr size_t kFirstSlots = 64;

uint32_t HashOf(std::string_view name) {
    return static_cast<uint32_t>(std::hash<std::string_view>()(name));
}

}  // namespace

NamePool::NamePool(size_t max_blocks) : m_max_blocks(max_blocks), m_slots(kFirstSlots) {
    (void)AddBlock(FIRST_BLOCK_BYTES);
}

int NamePool::Add(std::string_view name, const char** out) {
    *out = nullptr;
    if (name.find('\0') != name.npos) return -1;
    const uint32_t hash = HashOf(name);
    size_t slot = SlotOf(name, hash);
    if (m_slots[slot].name == nullptr) {
        const char* stored = Store(name);
        if (stored == nullptr) {
            m_has_room = false;
            return -1;
        }
        // At most four fifths full: beyond that the runs of taken slots get long.
        if ((m_count + 1) * 5 > m_slots.size() * 4) {
            Grow();
            slot = SlotOf(name, hash);
        }
        m_slots[slot] = {stored, hash, static_cast<uint32_t>(name.size())};
        ++m_count;
    }
    *out = m_slots[slot].name;
    return 0;
}

const char* NamePool::Find(std::string_view name) const {
    return m_slots[SlotOf(name, HashOf(name))].name;
}

// The slot that holds the name, or the free one where it belongs.
size_t NamePool::SlotOf(std::string_view name, uint32_t hash) const {
    const size_t mask = m_slots.size() - 1;
    size_t slot = hash & mask;
    for (; m_slots[slot].name != nullptr; slot = (slot + 1) & mask) {
        const Slot& at = m_slots[slot];
        if (at.hash == hash && std::string_view(at.name, at.length) == name) break;
    }
    return slot;
}

// Copies the name into the first block with room, or into a new one; null when there is none.
const char* NamePool::Store(std::string_view name) {
    const size_t need = name.size() + 1;
    const auto has_room = [need](const Block& b) { return b.size - b.used >= need; };
    auto block = std::find_if(m_blocks.begin(), m_blocks.end(), has_room);
    if (block == m_blocks.end()) {
        const size_t last = m_blocks.empty() ? 0 : m_blocks.back().size;
        if (!AddBlock(std::max(last, need) * 2)) return nullptr;
        block = m_blocks.end() - 1;
    }
    char* stored = block->data.get() + block->used;
    std::memcpy(stored, name.data(), name.size());
    stored[name.size()] = '\0';
    block->used += need;
    return stored;
}

bool NamePool::AddBlock(size_t size) {
    if (m_blocks.size() >= m_max_blocks) return false;
    std::unique_ptr<char[]> data(new (std::nothrow) char[size]);
    if (data == nullptr) return false;
    m_blocks.push_back({std::move(data), size, 0});
    return true;
}

void NamePool::Grow() {
    std::vector<Slot> old(m_slots.size() * 2);
    old.swap(m_slots);
    const size_t mask = m_slots.size() - 1;
    for (const Slot& entry : old) {
        if (entry.name == nullptr) continue;
        size_t slot = entry.hash & mask;
        while (m_slots[slot].name != nullptr) slot = (slot + 1) & mask;
        m_slots[slot] = entry;
    }
}
