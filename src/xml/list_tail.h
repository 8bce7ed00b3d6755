// Appending to the records' singly linked lists. Lists keep no tail pointer of their own, so a
// walk that appends many siblings remembers the last node it appended: a document with 100,000
// Impression or Tracking siblings is read in linear time, and document order is kept.
#pragma once

namespace ka {

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

}  // namespace ka
