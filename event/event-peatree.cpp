#include "event/event-peatree.h"

#include <algorithm>
#include <string_view>

#include "event/event-children.h"
#include "event/event-text.h"
#include "utils/log.h"

namespace {

constexpr size_t kMaxComponent = 1023;

// Takes a path apart: separators at the ends or repeated produce nothing, and the rest of a
// component that is too long is the next component.
class PathComponents {
public:
    explicit PathComponents(const std::string& path)
        : m_rest(path), m_path_size(path.size()), m_is_plain(!path.empty() && path[0] == '/') {}

    bool Next(std::string_view& component) {
        const size_t start = m_rest.find_first_not_of('/');
        if (start == std::string_view::npos) {
            m_rest = {};
            return false;
        }
        m_rest.remove_prefix(start);
        const size_t end = m_rest.substr(0, kMaxComponent + 1).find('/');
        const size_t size =
            end != std::string_view::npos ? end : std::min(m_rest.size(), kMaxComponent);
        if (end == std::string_view::npos && size < m_rest.size()) m_is_plain = false;
        component = m_rest.substr(0, size);
        m_rest.remove_prefix(size);
        m_plain_size += 1 + size;
        return true;
    }

    // After the last component: true when the path is the one that its nodes spell.
    [[nodiscard]] bool IsPlain() const {
        if (!m_is_plain) return false;
        return m_path_size == (m_plain_size == 0 ? 1 : m_plain_size);
    }

private:
    std::string_view m_rest;
    size_t m_path_size;
    size_t m_plain_size = 0;
    bool m_is_plain;
};

}  // namespace

// Where the clearing stands in one folder.
struct EventPeaTree::ClearFrame {
    EventNode* node;
    EventNode* next_child;
    EventCounter delta;  // what the children have lost so far
};

EventPeaTree::EventPeaTree() : m_root(EventNode::Create("/", 0, nullptr)) {}

EventPeaTree::~EventPeaTree() { EventNode::Destroy(m_root); }

void EventPeaTree::Place::operator()(Event& event) const {
    node->GetPath(event.path);
    event.task_id = task_id;
}

EventNode* EventPeaTree::FindNode(const std::string& path) const {
    EventNode* node = m_root;
    PathComponents components(path);
    for (std::string_view name; node != nullptr && components.Next(name);) {
        const EventChildren* const children = node->children;
        node = children != nullptr ? children->Find(name, EventChildren::HashName(name)) : nullptr;
    }
    return node;
}

EventNode* EventPeaTree::MakeNode(const std::string& path, bool& is_plain_path) {
    EventNode* node = m_root;
    PathComponents components(path);
    for (std::string_view name; components.Next(name);) {
        const uint32_t hash = EventChildren::HashName(name);
        EventNode* child = node->children != nullptr ? node->children->Find(name, hash) : nullptr;
        if (child == nullptr) child = EventNode::Create(name, hash, node);
        node = child;
    }
    is_plain_path = components.IsPlain();
    return node;
}

void EventPeaTree::Propagate(EventNode* node, EventKind kind, const EventCounter& delta) {
    const bool is_changed = delta != EventCounter{};
    for (; node != nullptr; node = node->parent) {
        node->totals[kind] += delta;
        if (!node->Refresh() && !is_changed) return;
    }
}

void EventPeaTree::Append(EventNode* node, EventKind kind, const Event& event, bool is_plain_path) {
    EventList& list = node->List(kind);
    list.PushBack(event, is_plain_path && event.task_id == m_task_id);
    Propagate(node, kind, list.BackCounter());
}

int EventPeaTree::Push(const Event& event) {
    SLOG_INFO("Push event: %s", EventText(event).CStr());
    if (IsEmpty()) m_task_id = event.task_id;  // nothing is kept yet that would take it for its own

    const EventKind kind = KindOf(event);
    bool is_plain_path = false;
    EventNode* const node = MakeNode(event.path, is_plain_path);
    EventList& list = node->List(kind);
    const bool is_removal = kind == KIND_FILE_OP && event.type == EV_REMOVE;
    const bool is_first = list.IsEmpty();

    if (!is_first && list.IsBackAlike(event)) {
        const EventCounter before = list.BackCounter();
        list.PopBack();
        list.PushBack(event, is_plain_path && event.task_id == m_task_id);
        Propagate(node, kind, list.BackCounter() - before);
        if (is_removal) {
            // This drops the older removal too, as the newer one's fields.
            ClearSubtree(node, kind);
            Append(node, kind, event, is_plain_path);
        }
    } else {
        if (is_removal) ClearSubtree(node, kind);
        Append(node, kind, event, is_plain_path);
    }
    if (is_first) Notify(NOTIFY_LIST_STARTED, event);
    Notify(NOTIFY_PUSHED, event);
    return 1;
}

// Depth first, children before their parent, each next child taken before the one that may go.
void EventPeaTree::ClearSubtree(EventNode* top, EventKind kind) {
    std::vector<ClearFrame> stack{
        {top, top->FirstChild(), {}}
    };
    while (!stack.empty()) {
        ClearFrame& frame = stack.back();
        if (EventNode* const child = frame.next_child) {
            frame.next_child = child->next;
            stack.push_back({child, child->FirstChild(), {}});
            continue;
        }
        FinishClearing(stack, kind);
    }
}

// The node on top of the stack, whose children are cleared. What it and they have lost is handed up
// one level at a time: to walk up to the root for each node would be quadratic in a deep tree.
void EventPeaTree::FinishClearing(std::vector<ClearFrame>& stack, EventKind kind) {
    EventNode* const node = stack.back().node;
    const bool is_top = stack.size() == 1;
    const bool had_events = !node->List(kind).IsEmpty();
    Event first;
    if (!is_top && had_events && HasObservers()) node->List(kind).LoadFront(PlaceOf(node), first);

    const EventCounter delta = stack.back().delta + ClearOwn(node, kind);
    stack.pop_back();
    node->totals[kind] += delta;
    node->Refresh();
    if (is_top) {
        if (node->parent != nullptr) Propagate(node->parent, kind, delta);
        return;
    }
    stack.back().delta += delta;
    if (!node->HasOwnEvents() && first.type != EV_EMPTY) Notify(NOTIFY_CLEARED_EMPTY, first);
    if (node->IsBare()) EventNode::Destroy(node);
}

// Returns by how much the node's own list has changed.
EventCounter EventPeaTree::ClearOwn(EventNode* node, EventKind kind) {
    EventCounter delta;
    const auto notify = [&](EventTreeNotification what, const StoredEvent& stored,
                            const Event* whole) {
        if (!HasObservers()) return;
        Event event;
        EventList::Load(stored, whole, PlaceOf(node), event);
        Notify(what, event);
    };
    node->List(kind).EraseIf([&](StoredEvent& stored, const Event* whole) {
        if (stored.Status() == PROCESSING &&
            (stored.Type() == EV_CREATE || stored.Type() == EV_COPY)) {
            stored.status = ABORT;
            notify(NOTIFY_ABORTED, stored, whole);
            return false;
        }
        if (stored.Status() != WAITTING) return false;
        notify(NOTIFY_DROPPED, stored, whole);
        delta -= EventCounter::Of(stored.Type(), stored.Status());
        return true;
    });
    return delta;
}

int EventPeaTree::Pop(Event& event) {
    if (m_root->nearest == EventNode::NOWHERE) {
        SLOG_DBG("No available event can be pop.\n");
        return 0;
    }
    EventNode* node = m_root;
    while (node->nearest != 0) node = node->children->FindNearest();

    const EventKind kind = node->List(KIND_FILE_OP).IsEmpty() ? KIND_SCAN : KIND_FILE_OP;
    EventList& list = node->List(kind);
    const EventCounter before = list.FrontCounter();
    list.SetFrontStatus(PROCESSING);
    Propagate(node, kind, list.FrontCounter() - before);

    list.LoadFront(PlaceOf(node), event);
    SLOG_INFO("Pop event: %s\n", EventText(event).CStr());
    Notify(NOTIFY_POPPED, event);
    if (node->parent != nullptr) node->parent->children->Rotate();
    return 1;
}

int EventPeaTree::Done(const Event& event) {
    SLOG_INFO("Done event: %s\n", EventText(event).CStr());
    EventNode* const node = FindNode(event.path);
    if (node == nullptr) {
        SLOG_CRIT("Done an event on nonexistent path '%s'.", event.path.c_str());
        return 0;
    }
    const EventKind kind = KindOf(event);
    EventList& list = node->List(kind);
    if (!list.IsInWork()) {
        SLOG_WARN("Done an event not in processing/abort state.\n");
        return 0;
    }
    const EventCounter before = list.FrontCounter();
    list.PopFront();
    Propagate(node, kind, EventCounter{} - before);
    Notify(NOTIFY_DONE, event);
    if (!node->HasOwnEvents()) Notify(NOTIFY_NODE_EMPTIED, event);
    Prune(node);
    return 1;
}

void EventPeaTree::Prune(EventNode* node) {
    // A node with events below has them counted in all its ancestors too.
    while (node->parent != nullptr && node->IsBare()) {
        EventNode* const parent = node->parent;
        EventNode::Destroy(node);
        node = parent;
    }
}

int EventPeaTree::Redo(const Event& event) {
    SLOG_INFO("Redo event: %s\n", EventText(event).CStr());
    EventNode* const node = FindNode(event.path);
    if (node == nullptr) {
        SLOG_CRIT("Redo an event on nonexistent path '%s'.", event.path.c_str());
        return 0;
    }
    const EventKind kind = KindOf(event);
    EventList& list = node->List(kind);
    if (!list.IsInWork()) {
        SLOG_CRIT("Redo an event not in processing/abort state.\n");
        return 0;
    }
    const EventCounter before = list.FrontCounter();
    list.SetFrontStatus(WAITTING);
    Propagate(node, kind, list.FrontCounter() - before);
    Notify(NOTIFY_REDONE, event);
    return 1;
}

void EventPeaTree::Clear() {
    EventNode::DestroyBelow(m_root);
    for (const EventKind kind : {KIND_FILE_OP, KIND_SCAN}) {
        m_root->List(kind).Clear();
        m_root->totals[kind] = {};
    }
    m_root->Refresh();
}

size_t EventPeaTree::Size() const {
    return static_cast<size_t>(m_root->Total(KIND_SCAN).count + m_root->Total(KIND_FILE_OP).count);
}

size_t EventPeaTree::ScanCount() const {
    return static_cast<size_t>(m_root->Total(KIND_SCAN).count);
}
