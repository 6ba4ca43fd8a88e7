#include "event/event-node.h"

#include <cstring>
#include <new>

#include "event/event-children.h"

// One for each waiting file: with a name of up to 31 bytes it takes 160 bytes of the heap.
static_assert(sizeof(void*) > 4 || sizeof(EventNode) <= 96);
static_assert(sizeof(EventNode) <= 120);

EventNode::EventNode(std::string_view name, uint32_t name_hash, EventNode* parent_node)
    : parent(parent_node), hash(name_hash), name_size(static_cast<uint16_t>(name.size())) {
    char* const bytes = reinterpret_cast<char*>(this + 1);
    std::memcpy(bytes, name.data(), name.size());
    bytes[name.size()] = '\0';
}

EventNode::~EventNode() { delete children; }

EventNode* EventNode::Create(std::string_view name, uint32_t hash, EventNode* parent) {
    void* const memory = ::operator new(sizeof(EventNode) + name.size() + 1);
    auto* const node = new (memory) EventNode(name, hash, parent);
    if (parent != nullptr) {
        if (parent->children == nullptr) parent->children = new EventChildren();
        parent->children->Append(node);
    }
    return node;
}

void EventNode::Free(EventNode* node) {
    node->~EventNode();
    ::operator delete(node);
}

void EventNode::Destroy(EventNode* node) {
    DestroyBelow(node);
    EventNode* const parent = node->parent;
    if (parent != nullptr) {
        parent->children->Remove(node);
        if (parent->children->IsEmpty()) {
            delete parent->children;
            parent->children = nullptr;
        }
    }
    Free(node);
}

// Leaves first, on the way back up along the parents. The indexes of the folders that go are not
// kept up to date meanwhile, which would be work for nothing.
void EventNode::DestroyBelow(EventNode* node) {
    EventNode* current = node->FirstChild();
    while (current != nullptr) {
        if (EventNode* const below = current->FirstChild()) {
            current = below;
            continue;
        }
        EventNode* const next = current->next;
        EventNode* const above = current->parent;
        Free(current);
        if (next != nullptr) {
            current = next;
            continue;
        }
        delete above->children;
        above->children = nullptr;
        current = above == node ? nullptr : above;
    }
}

EventNode* EventNode::FirstChild() const {
    return children != nullptr ? children->First() : nullptr;
}

void EventNode::GetPath(std::string& path) const {
    size_t size = 0;
    for (const EventNode* node = this; node->parent != nullptr; node = node->parent) {
        size += 1U + node->name_size;
    }
    if (size == 0) {
        path.assign(1, '/');
        return;
    }
    path.resize(size);
    for (const EventNode* node = this; node->parent != nullptr; node = node->parent) {
        size -= node->name_size;
        std::memcpy(&path[size], node->NameData(), node->name_size);
        path[--size] = '/';
    }
}

uint32_t EventNode::ComputeNearest() const {
    if (IsBare()) return NOWHERE;
    if (lists[KIND_SCAN].IsBlocked() || lists[KIND_FILE_OP].IsBlocked()) return NOWHERE;
    const bool is_quiet = totals[KIND_SCAN].processing == 0 && totals[KIND_FILE_OP].processing == 0;
    if (is_quiet && HasOwnEvents()) return 0;
    const EventNode* const child = children != nullptr ? children->FindNearest() : nullptr;
    return child != nullptr ? child->nearest + 1 : NOWHERE;
}

bool EventNode::Refresh() {
    const uint32_t now = ComputeNearest();
    if (now == nearest) return false;
    if (parent != nullptr) {
        parent->children->SetNearest(this, now);
    } else {
        nearest = now;
    }
    return true;
}
