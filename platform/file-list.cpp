#include "utils/file-list.h"

#include <algorithm>
#include <cassert>
#include <cstring>
#include <functional>

#include "utils/log.h"

namespace {

constexpr size_t kFirstSlots = 16;
constexpr int kIsFile = -1;

}  // namespace

const int* FileListNames::Find(const char* name) const {
    if (m_slots.empty()) return nullptr;
    const Slot& slot = m_slots[SlotOf(name)];
    return slot.name == nullptr ? nullptr : &slot.value;
}

void FileListNames::Insert(const char* name, int value) {
    if ((m_count + 1) * 5 > m_slots.size() * 4) Grow();
    m_slots[SlotOf(name)] = {name, value};
    ++m_count;
}

size_t FileListNames::SlotOf(const char* name) const {
    const size_t mask = m_slots.size() - 1;
    // Addresses of neighbours differ in few bits: a multiplication spreads them.
    const uint64_t spread = reinterpret_cast<uintptr_t>(name) * UINT64_C(0x9E3779B97F4A7C15);
    size_t slot = static_cast<size_t>(spread >> 32) & mask;
    while (m_slots[slot].name != nullptr && m_slots[slot].name != name) slot = (slot + 1) & mask;
    return slot;
}

void FileListNames::Grow() {
    std::vector<Slot> old(m_slots.empty() ? kFirstSlots : m_slots.size() * 2);
    old.swap(m_slots);
    for (const Slot& entry : old) {
        if (entry.name != nullptr) m_slots[SlotOf(entry.name)] = entry;
    }
}

FileList::FileList(NamePool& pool) : m_pool(pool), m_dirs(1) { m_dirs[0].name = "/"; }

int FileList::AddFile(int dir_index, std::string_view name, uint32_t mtime, uint64_t size) {
    const char* stored = nullptr;
    if (dir_index < 0) return -1;
    FileListDir& dir = m_dirs[Slot(dir_index)];
    if (m_pool.Add(name, &stored) != 0 || dir.names.Find(stored) != nullptr) return -1;
    dir.names.Insert(stored, kIsFile);
    dir.files.push_back({stored, mtime, size});
    dir.is_sorted = false;
    return 0;
}

int FileList::AddDir(int dir_index, std::string_view name, uint32_t mtime) {
    const char* stored = nullptr;
    if (dir_index < 0) return -1;
    if (m_pool.Add(name, &stored) != 0) return -1;
    if (m_dirs[Slot(dir_index)].names.Find(stored) != nullptr) return -1;
    const int index = static_cast<int>(m_dirs.size());
    m_dirs.emplace_back();
    m_dirs.back().name = stored;
    m_dirs.back().parent = dir_index;
    m_dirs.back().mtime = mtime;
    FileListDir& dir = m_dirs[Slot(dir_index)];
    dir.names.Insert(stored, index);
    dir.dirs.push_back(index);
    dir.is_sorted = false;
    return index;
}

int FileList::AddFileByPath(std::string_view path, uint32_t mtime, uint64_t size) {
    std::string_view name;
    const int parent = MakeParents(path, name);
    if (parent < 0) return -1;
    SLOG_DBG("adding file '%.*s'\n", static_cast<int>(name.size()), name.data());
    return AddFile(parent, name, mtime, size);
}

int FileList::AddDirByPath(std::string_view path, uint32_t mtime) {
    std::string_view name;
    const int parent = MakeParents(path, name);
    if (parent < 0) return -1;
    SLOG_DBG("adding directory '%.*s'\n", static_cast<int>(name.size()), name.data());
    const int existing = FindDir(parent, name);
    if (existing < 0) return AddDir(parent, name, mtime) < 0 ? -1 : 0;
    m_dirs[Slot(existing)].mtime = mtime;
    return 0;
}

int FileList::FindDir(int parent, std::string_view name) const {
    const char* stored = m_pool.Find(name);
    const int* found = stored == nullptr ? nullptr : m_dirs[Slot(parent)].names.Find(stored);
    return found == nullptr ? -1 : *found;
}

int FileList::MakeParents(std::string_view path, std::string_view& name) {
    if (path.empty() || path.back() == '/' || path.size() > MAX_PATH_LENGTH) return -1;
    const size_t slash = path.rfind('/');
    const std::string_view folder = slash == path.npos ? path.substr(0, 0) : path.substr(0, slash);
    name = slash == path.npos ? path : path.substr(slash + 1);
    SLOG_DBG("searching parent '%.*s'\n", static_cast<int>(folder.size()), folder.data());
    if (name.size() > MAX_COMPONENT) return -1;

    int dir = ROOT;
    for (size_t start = 0; start < folder.size();) {
        const size_t end = std::min(folder.find('/', start), folder.size());
        const std::string_view component = folder.substr(start, end - start);
        start = end + 1;
        if (component.empty()) continue;
        if (component.size() > MAX_COMPONENT) return -1;
        const int existing = FindDir(dir, component);
        dir = existing >= 0 ? existing : AddDir(dir, component, 0);
        if (dir < 0) return -1;
    }
    return dir;
}

namespace {

// A name to be sorted: most comparisons are settled by the first bytes that differ within the
// folder, without a look at the text itself.
struct SortKey {
    uint64_t head;
    const char* rest;
    size_t position;
};

bool IsLess(const SortKey& a, const SortKey& b) {
    return a.head != b.head ? a.head < b.head : std::strcmp(a.rest, b.rest) < 0;
}

// The first 8 bytes as a number that orders as they do; fewer are filled up with zeros.
uint64_t HeadOf(const char* text) {
    uint64_t head = 0;
    int i = 0;
    for (; i < 8 && text[i] != '\0'; ++i) head = head << 8 | static_cast<unsigned char>(text[i]);
    return i == 0 ? 0 : head << (8 * (8 - i));
}

// The order of `count` names, as their positions.
template <typename NameAt>
std::vector<SortKey> SortedNames(size_t count, NameAt name_at) {
    const char* first = name_at(0);
    size_t common = std::strlen(first);
    for (size_t i = 1; i < count; ++i) {
        const char* name = name_at(i);
        size_t same = 0;
        while (same < common && name[same] == first[same]) ++same;
        common = same;
    }
    std::vector<SortKey> keys;
    keys.reserve(count);
    for (size_t i = 0; i < count; ++i) {
        const char* name = name_at(i) + common;
        keys.push_back({HeadOf(name), name, i});
    }
    std::sort(keys.begin(), keys.end(), IsLess);
    return keys;
}

template <typename Item, typename NameOf>
void SortByName(std::vector<Item>& items, NameOf name_of) {
    if (items.size() < 2) return;
    const auto keys = SortedNames(items.size(), [&](size_t i) { return name_of(items[i]); });
    std::vector<Item> sorted;
    sorted.reserve(items.size());
    for (const SortKey& key : keys) sorted.push_back(items[key.position]);
    items.swap(sorted);
}

}  // namespace

const FileListDir& FileList::Sorted(int dir_index) const {
    FileListDir& dir = m_dirs[Slot(dir_index)];
    if (dir.is_sorted) return dir;
    SortByName(dir.files, [](const FileListFile& file) { return file.name; });
    SortByName(dir.dirs, [this](int index) { return m_dirs[Slot(index)].name; });
    dir.is_sorted = true;
    return dir;
}
