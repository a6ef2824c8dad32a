// SPDX-License-Identifier: Apache-2.0
// The platform's growing array. Elements are copied in; any insertion or removal
// invalidates iterators and references, but not indexes below it. An index beyond the
// end is the caller's fault and ends the program.
#ifndef PLATFORM_UTILS_VECTOR_H_
#define PLATFORM_UTILS_VECTOR_H_

#include <stddef.h>
#include <stdlib.h>
#include <sys/types.h>

#include <vector>

namespace android {

template <typename T>
class Vector {
public:
    typedef typename std::vector<T>::iterator iterator;
    typedef typename std::vector<T>::const_iterator const_iterator;

    iterator begin() { return m_items.begin(); }
    const_iterator begin() const { return m_items.begin(); }
    iterator end() { return m_items.end(); }
    const_iterator end() const { return m_items.end(); }

    bool isEmpty() const { return m_items.empty(); }
    bool empty() const { return m_items.empty(); }
    size_t size() const { return m_items.size(); }
    void clear() { m_items.clear(); }

    const T& operator[](size_t index) const { return itemAt(index); }
    const T& itemAt(size_t index) const { return m_items[checked(index, m_items.size())]; }
    T& editItemAt(size_t index) { return m_items[checked(index, m_items.size())]; }

    // These return the index of the new element.
    ssize_t add(const T& value) {
        m_items.push_back(value);
        return static_cast<ssize_t>(m_items.size() - 1);
    }
    ssize_t insertAt(const T& value, size_t index) {
        m_items.insert(at(checked(index, m_items.size() + 1)), value);
        return static_cast<ssize_t>(index);
    }
    void push(const T& value) { m_items.push_back(value); }
    void push_back(const T& value) { m_items.push_back(value); }

    // Returns the index removed, where the next element now is.
    ssize_t removeAt(size_t index) {
        m_items.erase(at(checked(index, m_items.size())));
        return static_cast<ssize_t>(index);
    }

private:
    static size_t checked(size_t index, size_t limit) {
        if (index >= limit) {
            abort();
        }
        return index;
    }
    iterator at(size_t index) { return m_items.begin() + static_cast<ptrdiff_t>(index); }

    std::vector<T> m_items;
};

}  // namespace android

#endif  // PLATFORM_UTILS_VECTOR_H_
