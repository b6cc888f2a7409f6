#pragma once

// A singly linked list of records that each are a heap block of their own and link to the `next`. The list
// owns them; `clear` or `remove` frees them.

namespace bakjob
{

template <class Record>
struct RecordList {
    int count;
    Record *head;
    Record *tail;

    void append(Record *record)
    {
        (head == nullptr ? head : tail->next) = record;
        tail = record;
        ++count;
    }

    // Unlinks and frees the record; false when it is not in the list.
    bool remove(Record *record)
    {
        Record *before = nullptr;
        Record *found = head;
        while (found != nullptr && found != record) {
            before = found;
            found = found->next;
        }
        if (found == nullptr) return false;
        (before == nullptr ? head : before->next) = found->next;
        if (tail == found) tail = before;
        --count;
        delete found;
        return true;
    }

    void clear()
    {
        while (head != nullptr) {
            Record *const first = head;
            head = first->next;
            delete first;
        }
        tail = nullptr;
        count = 0;
    }
};

} // namespace bakjob
