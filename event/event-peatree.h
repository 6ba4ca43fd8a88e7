// The pending work of one task: a tree of path components in which each node holds the events for
// exactly that path. It decides which event may run next, so that any number of workers can work on
// one task and still no entry is made before its parent, nothing is copied into a folder that is
// being removed, and no removal starts while anything below it is running.
//
// Threads: not safe; every call comes under the mutex of the pool that owns the tree.
// Cost: an operation takes time by the depth of its path and the logarithm of a folder's
// subfolders, whatever the number of events. No operation is recursive: trees may be of any depth.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "event/event-node.h"
#include "event/event.h"
#include "event/observable.h"

enum EventTreeNotification : int {
    NOTIFY_PUSHED = 0,   // at the very end of every Push
    NOTIFY_POPPED = 1,   // the event is PROCESSING already
    NOTIFY_DONE = 2,     // the caller's event, after it left the list
    NOTIFY_REDONE = 3,   // the caller's event, after its status went back
    NOTIFY_DROPPED = 4,  // a waiting event that a removal makes obsolete, just before it goes
    NOTIFY_ABORTED = 5,  // a running create or copy below a removal, just after it became ABORT
    NOTIFY_LIST_STARTED = 6,  // Push into a list that was empty; before NOTIFY_PUSHED
    NOTIFY_NODE_EMPTIED = 7,  // by Done, both lists of the node are empty now
    NOTIFY_CLEARED_EMPTY =
        8,  // a node below a removal that is empty now; its first event as it was
};

class EventPeaTree final : public Observable<EventPeaTree, EventTreeNotification, Event> {
public:
    EventPeaTree();
    ~EventPeaTree() override;

    // Always 1. A removal makes all file operations obsolete that wait at its path and below.
    int Push(const Event& event);
    // 1 with the event in `event`, 0 when nothing can run now. The event stays, as PROCESSING.
    [[nodiscard]] int Pop(Event& event);
    // Ends, or gives back, the event in work at the path and of the kind of `event`; nothing else
    // of it is looked at. 1, or 0 (logged) when there is none.
    int Done(const Event& event);
    int Redo(const Event& event);
    // Drops everything, without notification.
    void Clear();
    // Events of both kinds, those in work included; ScanCount() of scans alone.
    [[nodiscard]] size_t Size() const;
    [[nodiscard]] size_t ScanCount() const;
    [[nodiscard]] bool IsEmpty() const { return Size() == 0; }
    // Writes the tree to the log, or into a string.
    void Dump() const;
    [[nodiscard]] std::string ToString() const;

private:
    struct ClearFrame;

    static EventKind KindOf(const Event& event) {
        return event.IsScan() ? KIND_SCAN : KIND_FILE_OP;
    }

    EventNode* FindNode(const std::string& path) const;
    EventNode* MakeNode(const std::string& path, bool& is_plain_path);
    // Adds `delta` to the node's totals of the kind and to those of all above it.
    static void Propagate(EventNode* node, EventKind kind, const EventCounter& delta);
    // Puts the event at the end of the node's list.
    void Append(EventNode* node, EventKind kind, const Event& event, bool is_plain_path);
    void ClearSubtree(EventNode* top, EventKind kind);
    void FinishClearing(std::vector<ClearFrame>& stack, EventKind kind);
    EventCounter ClearOwn(EventNode* node, EventKind kind);
    static void Prune(EventNode* node);
    // Completes an event whose path and task are those of its place.
    struct Place {
        const EventNode* node;
        uint64_t task_id;
        void operator()(Event& event) const;
    };
    Place PlaceOf(const EventNode* node) const { return {node, m_task_id}; }

    EventNode* const m_root;
    uint64_t m_task_id = 0;  // of the events that are kept without it; set with the first event
};
