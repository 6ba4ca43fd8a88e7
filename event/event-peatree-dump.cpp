// The tree as text, for the log or a string.

#include "event/event-peatree.h"
#include "event/event-text.h"
#include "utils/log.h"

namespace {

// Calls on_node(depth, node) for the root and all below, parents first and children in list order,
// without recursion; a child's depth is its parent's plus 2.
template <typename OnNode>
void ForEachNode(const EventNode* root, const OnNode& on_node) {
    size_t depth = 0;
    for (const EventNode* node = root; node != nullptr;) {
        on_node(depth, node);
        if (const EventNode* const below = node->FirstChild()) {
            node = below;
            depth += 2;
            continue;
        }
        while (node != root && node->next == nullptr) {
            node = node->parent;
            depth -= 2;
        }
        node = node == root ? nullptr : node->next;
    }
}

}  // namespace

void EventPeaTree::Dump() const {
    ForEachNode(m_root, [this](size_t depth, const EventNode* node) {
        const EventCounter& file_op = node->Total(KIND_FILE_OP);
        const EventCounter& scan = node->Total(KIND_SCAN);
        std::string indent(depth, ' ');
        SLOG_INFO(
            "%s* %s - event count: {file_op: %zd, scan: %zd, tfile_op: %d, tscan: %d, "
            "tfile_op_p: %d, tscan_p: %d, tfile_op_nr: %d, tscan_nr: %d}\n",
            indent.c_str(), node->NameCStr(), static_cast<ssize_t>(node->List(KIND_FILE_OP).Size()),
            static_cast<ssize_t>(node->List(KIND_SCAN).Size()), file_op.count, scan.count,
            file_op.processing, scan.processing, file_op.non_remove, scan.non_remove);
        indent.append(4, ' ');
        for (const EventKind kind : {KIND_SCAN, KIND_FILE_OP}) {
            node->List(kind).ForEach(PlaceOf(node), [&indent](const Event& event) {
                SLOG_INFO("%s> %s\n", indent.c_str(), EventText(event).CStr());
            });
        }
    });
}

std::string EventPeaTree::ToString() const {
    std::string text;
    ForEachNode(m_root, [this, &text](size_t depth, const EventNode* node) {
        const EventCounter& file_op = node->Total(KIND_FILE_OP);
        const EventCounter& scan = node->Total(KIND_SCAN);
        text.append(depth, ' ').append("* ").append(node->Name()).append(" - event count: {");
        text.append("file_op: ").append(std::to_string(node->List(KIND_FILE_OP).Size()));
        text.append(", scan:").append(std::to_string(node->List(KIND_SCAN).Size()));
        text.append(", tfile_op:").append(std::to_string(file_op.count));
        text.append(", tscan:").append(std::to_string(scan.count));
        text.append(", tfile_op_p:").append(std::to_string(file_op.processing));
        text.append(", tscan_p:").append(std::to_string(scan.processing));
        text.append(", tfile_op_nr:").append(std::to_string(file_op.non_remove));
        text.append(", tscan_nr:").append(std::to_string(scan.non_remove)).append("}\n");
        for (const EventKind kind : {KIND_SCAN, KIND_FILE_OP}) {
            node->List(kind).ForEach(PlaceOf(node), [depth, &text](const Event& event) {
                text.append(depth + 4, ' ')
                    .append("> ")
                    .append(EventText(event).View())
                    .append("\n");
            });
        }
    });
    return text;
}
