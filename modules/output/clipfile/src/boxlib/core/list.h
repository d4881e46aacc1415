// Singly linked lists of records: head and tail stand in the parent, `next` is the record's last field.
#pragma once

#include "boxlib/core/context.h"

template <typename Record>
struct MbxList {
    Record* first;
    Record* last;
};

// Hangs a record on the tail; the list owns it from then on.
template <typename Record>
void MbxListAppend(MbxList<Record>* list, Record* record) {
    if (list->last != nullptr) {
        list->last->next = record;
    } else {
        list->first = record;
    }
    list->last = record;
}

// The number of records from `first` on. MBX_ERR_INVALID_ARG for a null result.
template <typename Record>
MbxStatus MbxListCount(const Record* first, uint32_t* count) {
    if (count == nullptr) return MBX_ERR_INVALID_ARG;
    *count = 0;
    for (; first != nullptr; first = first->next) ++*count;
    return MBX_OK;
}

// The number of records of a list for a field that carries up to `limit`: MBX_ERR_OVERFLOW above it.
template <typename Record>
MbxStatus MbxListCountUpTo(const MbxList<Record>* list, uint32_t limit, uint32_t* count) {
    MBX_TRY(MbxListCount<Record>(list->first, count));
    return *count <= limit ? MBX_OK : MBX_ERR_OVERFLOW;
}

// The record at a 1-based index, null beyond the end. MBX_ERR_INVALID_ARG for a null result or an index of 0.
template <typename Record>
MbxStatus MbxListAt(Record* first, uint32_t index, Record** record) {
    if (record == nullptr || index == 0) return MBX_ERR_INVALID_ARG;
    while (first != nullptr && --index != 0) first = first->next;
    *record = first;
    return MBX_OK;
}

// As MbxListAt, for callers to whom a record beyond the end is MBX_ERR_NOT_FOUND.
template <typename Record>
MbxStatus MbxListRequire(Record* first, uint32_t index, Record** record) {
    MBX_TRY(MbxListAt(first, index, record));
    return *record != nullptr ? MBX_OK : MBX_ERR_NOT_FOUND;
}

// The first record that `matches`, null if none does; `position`, which may be null, receives its 1-based
// place, or 0. MBX_ERR_INVALID_ARG for a null result.
template <typename Record, typename Matches>
MbxStatus MbxListFind(Record* first, Matches&& matches, Record** record, uint32_t* position) {
    if (record == nullptr) return MBX_ERR_INVALID_ARG;
    uint32_t place = 1;
    while (first != nullptr && !matches(*first)) {
        first = first->next;
        place++;
    }
    *record = first;
    if (position != nullptr) *position = first != nullptr ? place : 0;
    return MBX_OK;
}

// Releases every record with `release(context, record)`, which frees the record itself too.
template <typename Record, typename Release>
MbxStatus MbxFreeList(MbxContext* context, MbxList<Record>* list, Release&& release) {
    while (list->first != nullptr) {
        Record* record = list->first;
        list->first = record->next;
        MBX_TRY(release(context, record));
    }
    list->last = nullptr;
    return MBX_OK;
}
