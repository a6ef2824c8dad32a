// SPDX-License-Identifier: Apache-2.0
// References that cannot dangle. A class whose objects are owned and destroyed by
// one owner while others still hold pointers to them derives from RefTarget; the
// holders keep an ObjectRef instead of a plain pointer. When the object is destroyed,
// every ObjectRef to it becomes null. No allocation, no counting: a reference never
// keeps its object alive. Single-threaded: an object, its references and its
// destruction belong to one thread.
#ifndef CORE_OBJECTREF_H_
#define CORE_OBJECTREF_H_

class RefTarget;

// One link in the list of references that a RefTarget keeps. Use ObjectRef<T>.
class ObjectRefBase {
protected:
    ObjectRefBase() = default;
    ~ObjectRefBase() { unlink(); }
    ObjectRefBase(const ObjectRefBase&) = delete;
    ObjectRefBase& operator=(const ObjectRefBase&) = delete;

    inline void link(RefTarget* target);
    inline void unlink();

    RefTarget* m_target = nullptr;

private:
    friend class RefTarget;
    ObjectRefBase* m_next = nullptr;
    ObjectRefBase** m_link = nullptr;  // the pointer that points to this reference
};

class RefTarget {
public:
    RefTarget() = default;
    RefTarget(const RefTarget&) = delete;
    RefTarget& operator=(const RefTarget&) = delete;

protected:
    ~RefTarget() { clear_refs(); }

    // Makes every reference null now. A class whose destructor runs code that may
    // reach its holders calls this first.
    void clear_refs() {
        while (m_refs) {
            m_refs->unlink();
        }
    }

private:
    friend class ObjectRefBase;
    ObjectRefBase* m_refs = nullptr;
};

inline void ObjectRefBase::link(RefTarget* target) {
    unlink();
    if (!target) {
        return;
    }
    m_target = target;
    m_next = target->m_refs;
    if (m_next) {
        m_next->m_link = &m_next;
    }
    m_link = &target->m_refs;
    target->m_refs = this;
}

inline void ObjectRefBase::unlink() {
    if (!m_target) {
        return;
    }
    *m_link = m_next;
    if (m_next) {
        m_next->m_link = m_link;
    }
    m_target = nullptr;
    m_next = nullptr;
    m_link = nullptr;
}

// A pointer to a T (derived from RefTarget) that becomes null when the T goes.
template <typename T>
class ObjectRef : private ObjectRefBase {
public:
    ObjectRef() = default;
    explicit ObjectRef(T* object) { link(object); }
    ObjectRef(const ObjectRef& other) : ObjectRefBase() { link(other.m_target); }
    ObjectRef& operator=(const ObjectRef& other) {
        if (this != &other) {
            link(other.m_target);
        }
        return *this;
    }
    ObjectRef& operator=(T* object) {
        link(object);
        return *this;
    }

    T* get() const { return static_cast<T*>(m_target); }
    T* operator->() const { return get(); }
    T& operator*() const { return *get(); }
    explicit operator bool() const { return m_target != nullptr; }
};

#endif  // CORE_OBJECTREF_H_
