// identity.h - private records of the id table and the access to places that wait for an address.
//
// Here: what identity_read.cpp (the table, registering, references) and forward.cpp (late resolution,
// moved addresses) share. Elsewhere: the contract (soap_identity.h), the pointer table (identity_write.cpp).
//
// Always: a chain of waiting places runs through the places themselves: each holds the address of the next
// one until it is filled. Places are only reached through load_place and store_place, as nothing says that
// they are aligned.
#pragma once

#include <cstring>

#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_identity.h>

// A place that takes the object through a hook: a value of its own, or an element of a container.
struct soap_forward_record {
    soap_forward_record *next;
    std::int32_t type; // type id of the place
    unsigned level;    // indirections at which the place holds the object
    void *place;
    std::size_t length; // containers: the index of the element
    std::size_t size;   // bytes that the place holds, for the byte copy
    soap_copy_hook hook;
};

// One id of the message, known from the object that has it, from references to it, or from both.
struct soap_id_record {
    soap_id_record *next;         // in its bucket, newest first
    soap_id_record *next_held;    // late resolution: in a queue of records, or in those that watch one place
    void *ptr;                    // the object; null until its id was met
    void *link;                   // chain of pointer places that wait for the address
    void *copy;                   // chain of value places that wait for a byte copy
    soap_forward_record *forward; // newest first
    std::size_t size;             // bytes of the object
    std::int32_t type;
    unsigned level;     // indirections at which the object is held, and those of the link chain
    std::uint64_t hash; // of the text, before the remainder is taken
    char id[1];         // "#" and the id, or an address outside the message; in the record itself
};

// The pointer at a waiting place.
inline void *load_place(const void *place)
{
    void *value = nullptr;
    std::memcpy(&value, place, sizeof value);
    return value;
}

inline void store_place(void *place, const void *value)
{
    std::memcpy(place, &value, sizeof value);
}

// True if `address` lies in the bytes from start up to, but not including, end.
inline bool within(const void *address, const void *start, const void *end)
{
    const auto at = reinterpret_cast<std::uintptr_t>(address);
    return at >= reinterpret_cast<std::uintptr_t>(start) && at < reinterpret_cast<std::uintptr_t>(end);
}

// Puts `count` new cells between a place and its address: the place points to a cell, the cell to the next
// one. Returns the last cell (the place itself for a count of 0), or null with SOAP_OUT_OF_MEMORY.
void *add_indirections(soap *ctx, void *place, unsigned count);

// Empties a chain: every place on it holds null afterwards. Sets the head to null.
void clear_place_chain(void **head);

// Copies the id into the id buffer, for the text of an error, and returns the error that it stores.
int id_failure(soap *ctx, const char *id, int error);
