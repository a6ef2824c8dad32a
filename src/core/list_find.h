// SPDX-License-Identifier: Apache-2.0
// Searching a list of objects. The handset's list iterators do not fit std::find.
#ifndef CORE_LIST_FIND_H_
#define CORE_LIST_FIND_H_

#include <utils/List.h>
#include <utils/String8.h>

// Where the object stands in the list; end() when it is not in it.
template <typename T>
typename android::List<T*>::iterator find_object(android::List<T*>& list, const T* object) {
    typename android::List<T*>::iterator it = list.begin();
    while (it != list.end() && *it != object) {
        ++it;
    }
    return it;
}

// The first object whose name_of() gives this name, or null.
template <typename T>
T* find_named(const android::List<T*>& list, const android::String8& (T::*name_of)() const,
              const android::String8& name) {
    for (T* object : list) {
        if ((object->*name_of)() == name) {
            return object;
        }
    }
    return nullptr;
}

#endif  // CORE_LIST_FIND_H_
