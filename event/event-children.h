// The children of one node of the event tree, in the order in which the search for the next event
// takes them: new ones go to the end, and each event handed out moves the first to the end.
//
// The search is breadth-first over all that is not blocked. To walk there each time would cost a
// visit of every finished folder of a level for every file below it. So each node knows how far
// below it the nearest event stands that may go (EventNode::nearest), and this object finds the
// first child, in list order, with the smallest such distance: that is where the walk would end.
// Kept as an ordered set over all children this would cost more memory than the events themselves.
// So only "settled" children are in the set. A cursor stands in the list: what lies before it is
// settled; from the cursor on nothing is known yet. It stops at the first child that has an event
// of its own that may go. A file waits behind the cursor, is met by it, runs and leaves: it never
// enters the set. The cursor passes a child once for each time it was put at the end.
//
// Not thread-safe. Does not own the nodes.
#pragma once

#include <cstddef>
#include <cstdint>
#include <set>
#include <string_view>
#include <utility>
#include <vector>

struct EventNode;

class EventChildren {
public:
    EventChildren() = default;
    EventChildren(const EventChildren&) = delete;
    EventChildren& operator=(const EventChildren&) = delete;

    [[nodiscard]] EventNode* First() const { return m_first; }
    [[nodiscard]] bool IsEmpty() const { return m_count == 0; }
    // Null when there is none. `hash` is HashName(name).
    [[nodiscard]] EventNode* Find(std::string_view name, uint32_t hash) const;
    void Append(EventNode* node);
    void Remove(EventNode* node);
    // Moves the first child to the end, if there are two at least.
    void Rotate();
    // Stores a child's new distance.
    void SetNearest(EventNode* node, uint32_t nearest);
    // The child in which the next event is found; null when no event below may go.
    [[nodiscard]] EventNode* FindNearest();

    // A keyed hash: no set of names can be prepared that all meet in one bucket.
    static uint32_t HashName(std::string_view name);

private:
    // Ordered by distance, then by place in the list.
    using Key = std::pair<uint32_t, uint64_t>;

    [[nodiscard]] bool IsSettled(const EventNode* node) const;
    void Link(EventNode* node);
    void Unlink(EventNode* node);
    void AddToIndex(EventNode* node);
    void RemoveFromIndex(EventNode* node);
    void Rehash(size_t bucket_count);
    void MoveCursor();

    EventNode* m_first = nullptr;
    EventNode* m_last = nullptr;
    EventNode* m_cursor = nullptr;  // the first child that is not settled; null when all are
    uint64_t m_next_place = 0;
    std::set<std::pair<Key, EventNode*>> m_settled;  // those with an event below that may go
    std::vector<EventNode*> m_buckets;               // empty while the children are few
    size_t m_count = 0;
};
