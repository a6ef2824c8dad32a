// SPDX-License-Identifier: Apache-2.0
// The platform's doubly linked list. Elements are copied in; a list of pointers does
// not own what they point to. An iterator stays valid until its own element is erased.
#ifndef PLATFORM_UTILS_LIST_H_
#define PLATFORM_UTILS_LIST_H_

#include <stddef.h>

#include <list>

namespace android {

template <typename T>
class List {
public:
    typedef typename std::list<T>::iterator iterator;
    typedef typename std::list<T>::const_iterator const_iterator;

    iterator begin() { return m_items.begin(); }
    const_iterator begin() const { return m_items.begin(); }
    iterator end() { return m_items.end(); }
    const_iterator end() const { return m_items.end(); }

    bool empty() const { return m_items.empty(); }
    size_t size() const { return m_items.size(); }  // constant time
    void clear() { m_items.clear(); }

    void push_back(const T& value) { m_items.push_back(value); }
    void push_front(const T& value) { m_items.push_front(value); }

    // Inserts before pos; returns the position of the new element.
    iterator insert(iterator pos, const T& value) { return m_items.insert(pos, value); }
    // Removes the element at pos; returns the position after it.
    iterator erase(iterator pos) { return m_items.erase(pos); }

private:
    std::list<T> m_items;
};

}  // namespace android

#endif  // PLATFORM_UTILS_LIST_H_
