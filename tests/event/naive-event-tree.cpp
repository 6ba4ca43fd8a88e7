#include "naive-event-tree.h"

#include <algorithm>
#include <deque>
#include <utility>

#include "event/event-peatree.h"
#include "event/event-text.h"

NaiveEventTree::NaiveEventTree() { m_root.name = "/"; }

std::vector<std::string> NaiveEventTree::Split(const std::string& path) {
    std::vector<std::string> components;
    std::string current;
    for (const char c : path) {
        if (c == '/' || current.size() == 1023) {
            if (!current.empty()) components.push_back(current);
            current.clear();
        }
        if (c != '/') current += c;
    }
    if (!current.empty()) components.push_back(current);
    return components;
}

EventCounter NaiveEventTree::CountList(const std::list<Event>& list) {
    EventCounter counter;
    for (const Event& event : list) {
        ++counter.count;
        if (event.status == PROCESSING || event.status == ABORT) ++counter.processing;
        if (event.type != EV_REMOVE) ++counter.non_remove;
    }
    return counter;
}

EventCounter NaiveEventTree::Total(const Node& node, bool is_scan) {
    EventCounter total = CountList(is_scan ? node.scan_events : node.file_ops);
    for (const Node& child : node.children) total += Total(child, is_scan);
    return total;
}

NaiveEventTree::Node* NaiveEventTree::Find(const std::string& path) {
    Node* node = &m_root;
    for (const std::string& name : Split(path)) {
        const auto found = node->index.find(name);
        if (found == node->index.end()) return nullptr;
        node = found->second;
    }
    return node;
}

NaiveEventTree::Node* NaiveEventTree::FindOrMake(const std::string& path) {
    Node* node = &m_root;
    for (const std::string& name : Split(path)) {
        Node*& child = node->index[name];
        if (child == nullptr) {
            child = &node->children.emplace_back();
            child->name = name;
            child->parent = node;
        }
        node = child;
    }
    return node;
}

void NaiveEventTree::Note(int what, const Event& event) {
    m_notes.push_back(std::to_string(what) + " " + ::ToString(event) + " " +
                      std::to_string(event.flags));
}

std::vector<std::string> NaiveEventTree::TakeNotes() { return std::exchange(m_notes, {}); }

int NaiveEventTree::Push(const Event& event) {
    Node* const node = FindOrMake(event.path);
    std::list<Event>& list = ListOf(*node, event.IsScan());
    const auto is_alike = [&] {
        return list.back().status == WAITTING && list.back().flags == event.flags &&
               list.back().type == event.type;
    };
    if (event.IsScan()) {
        if (list.empty()) {
            list.push_back(event);
            Note(NOTIFY_LIST_STARTED, event);
        } else if (is_alike()) {
            list.back() = event;
        } else {
            list.push_back(event);
        }
    } else if (list.empty()) {
        if (event.type == EV_REMOVE) ClearSubtree(node, false, 0);
        list.push_back(event);
        Note(NOTIFY_LIST_STARTED, event);
    } else if (is_alike()) {
        list.back() = event;
        if (event.type == EV_REMOVE) {
            ClearSubtree(node, false, 0);
            list.push_back(event);
        }
    } else {
        if (event.type == EV_REMOVE) ClearSubtree(node, false, 0);
        list.push_back(event);
    }
    Note(NOTIFY_PUSHED, event);
    return 1;
}

void NaiveEventTree::ClearSubtree(Node* node, bool is_scan, int depth) {
    for (auto it = node->children.begin(); it != node->children.end();) {
        Node& child = *it++;
        ClearSubtree(&child, is_scan, depth + 1);
    }
    std::list<Event>& list = ListOf(*node, is_scan);
    const Event first = list.empty() ? Event{} : list.front();
    for (auto it = list.begin(); it != list.end();) {
        if (it->status == PROCESSING && (it->type == EV_CREATE || it->type == EV_COPY)) {
            it->status = ABORT;
            Note(NOTIFY_ABORTED, *it);
        } else if (it->status == WAITTING) {
            Note(NOTIFY_DROPPED, *it);
            it = list.erase(it);
            continue;
        }
        ++it;
    }
    if (depth == 0) return;
    if (node->scan_events.empty() && node->file_ops.empty() && first.type != EV_EMPTY) {
        Note(NOTIFY_CLEARED_EMPTY, first);
    }
    if (Total(*node, true).count == 0 && Total(*node, false).count == 0) RemoveFromParent(node);
}

void NaiveEventTree::RemoveFromParent(Node* node) {
    Node* const parent = node->parent;
    if (parent == nullptr) return;
    parent->index.erase(node->name);
    parent->children.remove_if([node](const Node& child) { return &child == node; });
}

bool NaiveEventTree::IsPassable(const Node& node) {
    if (Total(node, true).count == 0 && Total(node, false).count == 0) return false;
    if (!node.scan_events.empty() && node.scan_events.front().status != WAITTING) return false;
    return node.file_ops.empty() || node.file_ops.front().status == WAITTING;
}

int NaiveEventTree::Pop(Event& out) {
    std::deque<Node*> queue{&m_root};
    while (!queue.empty()) {
        Node* const node = queue.front();
        queue.pop_front();
        if (!IsPassable(*node)) continue;
        const bool is_quiet =
            Total(*node, true).processing == 0 && Total(*node, false).processing == 0;
        std::list<Event>& list = !node->file_ops.empty() ? node->file_ops : node->scan_events;
        if (is_quiet && !list.empty()) {
            list.front().status = PROCESSING;
            Note(NOTIFY_POPPED, list.front());
            out = list.front();
            Node* const parent = node->parent;
            if (parent != nullptr && parent->children.size() >= 2) {
                parent->children.splice(parent->children.end(), parent->children,
                                        parent->children.begin());
            }
            return 1;
        }
        for (Node& child : node->children) {
            if (IsPassable(child)) queue.push_back(&child);
        }
    }
    return 0;
}

int NaiveEventTree::Done(const Event& event) {
    Node* node = Find(event.path);
    if (node == nullptr) return 0;
    std::list<Event>& list = ListOf(*node, event.IsScan());
    if (list.empty() || (list.front().status != PROCESSING && list.front().status != ABORT)) {
        return 0;
    }
    list.pop_front();
    Note(NOTIFY_DONE, event);
    if (node->scan_events.empty() && node->file_ops.empty()) Note(NOTIFY_NODE_EMPTIED, event);
    while (node->parent != nullptr && Total(*node, true).count == 0 &&
           Total(*node, false).count == 0) {
        Node* const parent = node->parent;
        RemoveFromParent(node);
        node = parent;
    }
    return 1;
}

int NaiveEventTree::Redo(const Event& event) {
    Node* const node = Find(event.path);
    if (node == nullptr) return 0;
    std::list<Event>& list = ListOf(*node, event.IsScan());
    if (list.empty() || (list.front().status != PROCESSING && list.front().status != ABORT)) {
        return 0;
    }
    list.front().status = WAITTING;
    Note(NOTIFY_REDONE, event);
    return 1;
}

void NaiveEventTree::Clear() {
    m_root.children.clear();
    m_root.index.clear();
    m_root.scan_events.clear();
    m_root.file_ops.clear();
}

size_t NaiveEventTree::Size() const {
    return static_cast<size_t>(Total(m_root, true).count + Total(m_root, false).count);
}

size_t NaiveEventTree::ScanCount() const { return static_cast<size_t>(Total(m_root, true).count); }

void NaiveEventTree::DumpNode(const Node& node, size_t depth, std::string& text) {
    const EventCounter file_op = Total(node, false);
    const EventCounter scan = Total(node, true);
    text += std::string(depth, ' ') + "* " + node.name +
            " - event count: {file_op: " + std::to_string(node.file_ops.size()) +
            ", scan:" + std::to_string(node.scan_events.size()) +
            ", tfile_op:" + std::to_string(file_op.count) +
            ", tscan:" + std::to_string(scan.count) +
            ", tfile_op_p:" + std::to_string(file_op.processing) +
            ", tscan_p:" + std::to_string(scan.processing) +
            ", tfile_op_nr:" + std::to_string(file_op.non_remove) +
            ", tscan_nr:" + std::to_string(scan.non_remove) + "}\n";
    for (const auto* list : {&node.scan_events, &node.file_ops}) {
        for (const Event& event : *list) {
            text += std::string(depth + 4, ' ') + "> " + ::ToString(event) + "\n";
        }
    }
    for (const Node& child : node.children) DumpNode(child, depth + 2, text);
}

std::string NaiveEventTree::ToString() const {
    std::string text;
    DumpNode(m_root, 0, text);
    return text;
}
