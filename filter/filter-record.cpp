#include "filter/filter-record.h"

#include <utility>

void StringList::Add(std::string value) {
    if (m_items.size() == m_items.capacity()) {
        m_items.reserve(m_items.empty() ? m_first_capacity : m_items.capacity() * 2);
    }
    m_items.push_back(std::move(value));
}

void StringList::Clear() { m_items = {}; }
