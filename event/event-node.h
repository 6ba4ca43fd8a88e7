// A node of the event tree: one path component with its events and what is counted below it.
//
// There is one node for each waiting file, and a level of a whole disk waits at once: the fields
// are chosen for few bytes, and the name stands behind them in the same piece of memory.
// Not thread-safe; used by EventPeaTree and EventChildren alone.
#pragma once

#include <array>
#include <cstdint>
#include <string>
#include <string_view>

#include "event/event-counter.h"
#include "event/event-list.h"

class EventChildren;

// The two lists of a node; also the order in which they are served.
enum EventKind : uint8_t { KIND_FILE_OP = 0, KIND_SCAN = 1 };

struct EventNode {
    static constexpr uint32_t NOWHERE = UINT32_MAX;

    // Makes a node and puts it at the end of the parent's children; the root has no parent.
    static EventNode* Create(std::string_view name, uint32_t hash, EventNode* parent);
    // Takes the node out of its parent and destroys it with everything below, without recursion.
    static void Destroy(EventNode* node);
    // Destroys everything below the node.
    static void DestroyBelow(EventNode* node);

    EventNode(const EventNode&) = delete;
    EventNode& operator=(const EventNode&) = delete;

    [[nodiscard]] std::string_view Name() const { return {NameData(), name_size}; }
    [[nodiscard]] const char* NameCStr() const { return NameData(); }
    [[nodiscard]] EventList& List(EventKind kind) { return lists[kind]; }
    [[nodiscard]] const EventList& List(EventKind kind) const { return lists[kind]; }
    [[nodiscard]] const EventCounter& Total(EventKind kind) const { return totals[kind]; }

    [[nodiscard]] bool HasOwnEvents() const {
        return !lists[KIND_FILE_OP].IsEmpty() || !lists[KIND_SCAN].IsEmpty();
    }
    // No event here or below.
    [[nodiscard]] bool IsBare() const {
        return totals[KIND_FILE_OP].count == 0 && totals[KIND_SCAN].count == 0;
    }
    [[nodiscard]] EventNode* FirstChild() const;
    // The path of the node with a leading "/"; the root is "/".
    void GetPath(std::string& path) const;

    // Brings `nearest` up to date after a change of the lists, the totals or a child's `nearest`.
    // True when it has changed: then the parent's is to be looked at too.
    bool Refresh();

    EventNode* const parent;
    EventNode* previous = nullptr;  // siblings, in list order
    EventNode* next = nullptr;
    EventNode* hash_next = nullptr;      // chain of the parent's index
    EventChildren* children = nullptr;   // owned; null for a leaf
    uint64_t place = 0;                  // grows along the sibling list
    std::array<EventCounter, 2> totals;  // over the lists of this node and of all below
    std::array<EventList, 2> lists;
    // How many levels below this node the next event that may go stands; 0: it is the node's own.
    uint32_t nearest = NOWHERE;
    const uint32_t hash;
    const uint16_t name_size;  // at most 1023

private:
    EventNode(std::string_view name, uint32_t name_hash, EventNode* parent_node);
    ~EventNode();
    [[nodiscard]] uint32_t ComputeNearest() const;
    [[nodiscard]] const char* NameData() const { return reinterpret_cast<const char*>(this + 1); }
    static void Free(EventNode* node);
};
