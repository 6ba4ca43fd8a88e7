#include "event/event-children.h"

#include <sys/random.h>

#include <algorithm>

#include "event/event-node.h"

namespace {

// Below this number a walk along the children costs less than a table.
constexpr size_t kFewChildren = 8;

constexpr uint64_t kPrime = 0x7FFFFFFF;  // 2^31 - 1

uint64_t MakeHashKey() {
    uint32_t random = 0;
    if (getrandom(&random, sizeof(random), GRND_NONBLOCK) != sizeof(random)) random = 0x2545F491;
    return 1000 + random % (kPrime - 2000);
}

uint64_t HashKey() {
    static const uint64_t key = MakeHashKey();
    return key;
}

}  // namespace

// The name as a polynomial over a prime field, taken at a secret point: two names of n bytes meet
// with a chance of n/3 in 2^31, whoever chose them.
uint32_t EventChildren::HashName(std::string_view name) {
    const uint64_t key = HashKey();
    uint64_t hash = name.size();
    const auto byte = [&name](size_t i) -> uint64_t { return static_cast<unsigned char>(name[i]); };
    size_t i = 0;
    for (; i + 3 <= name.size(); i += 3) {
        hash = (hash * key + (byte(i) | byte(i + 1) << 8 | byte(i + 2) << 16)) % kPrime;
    }
    for (; i < name.size(); ++i) hash = (hash * key + byte(i)) % kPrime;
    return static_cast<uint32_t>(hash * key % kPrime);
}

EventNode* EventChildren::Find(std::string_view name, uint32_t hash) const {
    if (m_buckets.empty()) {
        EventNode* node = m_first;
        while (node != nullptr && (node->hash != hash || node->Name() != name)) node = node->next;
        return node;
    }
    EventNode* node = m_buckets[hash & (m_buckets.size() - 1)];
    while (node != nullptr && (node->hash != hash || node->Name() != name)) node = node->hash_next;
    return node;
}

void EventChildren::Append(EventNode* node) {
    Link(node);
    ++m_count;
    if (m_count > std::max(m_buckets.size(), kFewChildren)) {
        Rehash(m_buckets.empty() ? kFewChildren * 4 : m_buckets.size() * 2);
    } else if (!m_buckets.empty()) {
        AddToIndex(node);
    }
}

void EventChildren::Remove(EventNode* node) {
    SetNearest(node, EventNode::NOWHERE);
    if (!m_buckets.empty()) RemoveFromIndex(node);
    Unlink(node);
    --m_count;
}

void EventChildren::Rotate() {
    if (m_count < 2) return;
    EventNode* const node = m_first;
    const uint32_t nearest = node->nearest;
    SetNearest(node, EventNode::NOWHERE);
    Unlink(node);
    Link(node);
    node->nearest = nearest;  // not settled, so that the set is not concerned
}

bool EventChildren::IsSettled(const EventNode* node) const {
    return m_cursor == nullptr || node->place < m_cursor->place;
}

void EventChildren::SetNearest(EventNode* node, uint32_t nearest) {
    if (node->nearest == nearest) return;
    if (IsSettled(node)) {
        if (node->nearest != EventNode::NOWHERE)
            m_settled.erase({
                {node->nearest, node->place},
                node
            });
        if (nearest != EventNode::NOWHERE)
            m_settled.insert({
                {nearest, node->place},
                node
            });
    }
    node->nearest = nearest;
}

void EventChildren::MoveCursor() {
    while (m_cursor != nullptr && m_cursor->nearest != 0) {
        if (m_cursor->nearest != EventNode::NOWHERE) {
            m_settled.insert({
                {m_cursor->nearest, m_cursor->place},
                m_cursor
            });
        }
        m_cursor = m_cursor->next;
    }
}

EventNode* EventChildren::FindNearest() {
    // A settled child comes before the cursor's in the list, but loses to it with a distance.
    if (!m_settled.empty() && m_settled.begin()->first.first == 0) return m_settled.begin()->second;
    MoveCursor();
    if (m_cursor != nullptr) return m_cursor;
    return m_settled.empty() ? nullptr : m_settled.begin()->second;
}

void EventChildren::Link(EventNode* node) {
    node->place = m_next_place++;
    node->previous = m_last;
    node->next = nullptr;
    (m_last != nullptr ? m_last->next : m_first) = node;
    m_last = node;
    if (m_cursor == nullptr) m_cursor = node;
}

void EventChildren::Unlink(EventNode* node) {
    if (m_cursor == node) m_cursor = node->next;
    (node->previous != nullptr ? node->previous->next : m_first) = node->next;
    (node->next != nullptr ? node->next->previous : m_last) = node->previous;
}

void EventChildren::AddToIndex(EventNode* node) {
    EventNode*& bucket = m_buckets[node->hash & (m_buckets.size() - 1)];
    node->hash_next = bucket;
    bucket = node;
}

void EventChildren::RemoveFromIndex(EventNode* node) {
    EventNode** link = &m_buckets[node->hash & (m_buckets.size() - 1)];
    while (*link != node) link = &(*link)->hash_next;
    *link = node->hash_next;
}

void EventChildren::Rehash(size_t bucket_count) {
    m_buckets = {};  // the old table is not needed: all nodes are in the list
    m_buckets.resize(bucket_count);
    for (EventNode* node = m_first; node != nullptr; node = node->next) AddToIndex(node);
}
