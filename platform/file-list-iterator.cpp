#include <cstring>

#include "utils/file-list.h"

FileListIterator FileList::begin() const {
    return FileListIterator(*this, FileListIterator::STATE_BACK);
}

FileListIterator FileList::end() const {
    return FileListIterator(*this, FileListIterator::STATE_DIR);
}

FileListIterator::FileListIterator(const FileList& list, State state)
    : m_list(&list), m_state(state) {
    if (state == STATE_DIR) return;
    Push(FileList::ROOT);
    Settle();
}

void FileListIterator::next() {
    Frame* top = &m_stack.back();
    if (m_state == STATE_FILE) {
        --top->files_left;
    } else {
        m_stack.pop_back();
        top = &m_stack.back();
        --top->dirs_left;
        m_dir = top->dir;
        m_state = STATE_BACK;
    }
    Settle();
}

// Enters a folder, at the end of both of its sets.
void FileListIterator::Push(int dir) {
    const FileListDir& node = m_list->Sorted(dir);
    m_entry.path.resize(m_stack.empty() ? 0 : m_stack.back().path_length);
    if (!m_stack.empty()) {
        m_entry.path += '/';
        m_entry.path += node.name;
    }
    m_stack.push_back({dir, node.files.size(), node.dirs.size(), m_entry.path.size()});
    m_dir = dir;
}

// Goes down to the next entry, from what is left of the folder on top.
void FileListIterator::Settle() {
    for (;;) {
        const Frame& top = m_stack.back();
        const FileListDir& node = m_list->Sorted(top.dir);
        const bool has_file = top.files_left > 0;
        if (top.dirs_left == 0) {
            m_state = has_file ? STATE_FILE : STATE_DIR;
            break;
        }
        const int dir = node.dirs[top.dirs_left - 1];
        if (has_file && std::strcmp(node.files[top.files_left - 1].name,
                                    m_list->m_dirs[FileList::Slot(dir)].name) > 0) {
            m_state = STATE_FILE;
            break;
        }
        Push(dir);
    }
    BuildEntry();
}

void FileListIterator::BuildEntry() {
    const Frame& top = m_stack.back();
    const FileListDir& node = m_list->m_dirs[FileList::Slot(top.dir)];
    m_entry.path.resize(top.path_length);
    m_entry.is_dir = m_state != STATE_FILE;
    m_entry.mtime = node.mtime;
    m_entry.size = 0;
    if (m_entry.is_dir) return;
    const FileListFile& file = node.files[top.files_left - 1];
    m_entry.path += '/';
    m_entry.path += file.name;
    m_entry.mtime = file.mtime;
    m_entry.size = file.size;
}
