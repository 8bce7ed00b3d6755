// Appending to the records' singly linked lists. Lists keep no tail pointer of their own, so
// whoever appends many nodes keeps the end it reached: a document with 100,000 Impression or
// Tracking siblings is read in linear time, and so is a merge that appends many copies.
#pragma once

#include <cstdint>

namespace ka {

// For the parsers' walks: appends one node at a time in document order.

// The last node appended to one list (identified by the address of its head field). Only
// valid while nothing frees nodes of that list: the parser resets it around each walk and in
// every release.
template <typename T>
class ListTail {
public:
    // Appends node (whose next must be null) at the end of *head.
    void Append(T** head, T* node) {
        T* last = (mHead == head) ? mTail : nullptr;
        if (last == nullptr) last = *head;
        // From the remembered node this loop stops at once; otherwise it walks from the head.
        while (last != nullptr && last->next != nullptr) last = last->next;
        if (last == nullptr) {
            *head = node;
        } else {
            last->next = node;
        }
        mHead = head;
        mTail = node;
    }

    void Reset() {
        mHead = nullptr;
        mTail = nullptr;
    }

private:
    T** mHead = nullptr;
    T* mTail = nullptr;
};

// For the merges: the end of a list being appended to, the link that receives the next node
// and the number of nodes before it. Found with one walk, then moved along each appended list.
template <typename T>
struct ListEnd {
    T** link;
    uint32_t count;
};

template <typename T>
ListEnd<T> FindEnd(T** head) {
    ListEnd<T> end = {head, 0};
    while (*end.link != nullptr) {
        end.link = &(*end.link)->next;
        ++end.count;
    }
    return end;
}

// Appends one node (whose next is null) at end, moves end past it and writes end's count into
// count; returns the node.
template <typename T>
T* Link(ListEnd<T>& end, T* node, uint32_t& count) {
    *end.link = node;
    end.link = &node->next;
    count = ++end.count;
    return node;
}

// The end of a list being filled whose count is kept elsewhere or not at all: each node
// appended in O(1).
template <typename T>
struct Tail {
    T** at = nullptr;
    void Start(T** head) {
        at = head;
        while (*at != nullptr) at = &(*at)->next;
    }
    void Add(T* node) {
        *at = node;
        at = &node->next;
    }
};

}  // namespace ka
