// The event tree in its plainest form: lists, full recounts and a search that walks everything. It
// is the measure for the real one.
#pragma once

#include <cstdint>
#include <list>
#include <map>
#include <string>
#include <vector>

#include "event/event-counter.h"
#include "event/event.h"

class NaiveEventTree {
public:
    NaiveEventTree();

    int Push(const Event& event);
    int Pop(Event& out);
    int Done(const Event& event);
    int Redo(const Event& event);
    void Clear();
    size_t Size() const;
    size_t ScanCount() const;
    std::string ToString() const;
    // What has been notified since the last call: "number text".
    std::vector<std::string> TakeNotes();

private:
    struct Node {
        std::string name;
        Node* parent = nullptr;
        std::list<Node> children;
        std::map<std::string, Node*> index;
        std::list<Event> scan_events;
        std::list<Event> file_ops;
    };

    static std::vector<std::string> Split(const std::string& path);
    static EventCounter CountList(const std::list<Event>& list);
    static EventCounter Total(const Node& node, bool is_scan);
    static bool IsPassable(const Node& node);
    static std::list<Event>& ListOf(Node& node, bool is_scan) {
        return is_scan ? node.scan_events : node.file_ops;
    }
    Node* Find(const std::string& path);
    Node* FindOrMake(const std::string& path);
    void ClearSubtree(Node* node, bool is_scan, int depth);
    static void RemoveFromParent(Node* node);
    static void DumpNode(const Node& node, size_t depth, std::string& text);
    void Note(int what, const Event& event);

    Node m_root;
    std::vector<std::string> m_notes;
};
