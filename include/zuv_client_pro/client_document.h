// client_document.h - members of data objects without pointers by hand: setting what is sent, reading what
// came.
//
// Elsewhere: the calls that send and bring such objects (client.h).
//
// Always: reading never follows a null pointer. What is absent reads as an empty object of its class, which
// is shared and never changes. Nothing here throws, but for std::bad_alloc where memory runs out; a host
// program that is compiled with -fno-exceptions ends there, as it does wherever it allocates.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <type_traits>
#include <utility>
#include <vector>

namespace zuv {

// An object of class T that may be absent: neither owned nor copied. It is valid as long as the object that
// the view was taken of.
template <class T> class view {
public:
    // A view of an object, or of nothing.
    //   object  may be null
    view(const T *object = nullptr) : object_(object) {}
    // Whether the object is there.
    //   true   it is there
    //   false  it is absent
    explicit operator bool() const { return object_ != nullptr; }
    // The object; an empty one if it is absent.
    //   returns  the object, which is never null
    const T &operator*() const { return object_ != nullptr ? *object_ : nothing(); }
    const T *operator->() const { return &**this; }
    // The object itself.
    //   returns  the object
    //   null     it is absent
    const T *get() const { return object_; }
    // The value, or another one if it is absent.
    //   otherwise  what to give if it is absent
    //   returns    a copy of one of the two
    template <class U> T value_or(U &&otherwise) const
    {
        return object_ != nullptr ? *object_ : static_cast<T>(std::forward<U>(otherwise));
    }

private:
    static const T &nothing()
    {
        static const T empty{};
        return empty;
    }
    const T *object_;
};

// The object of a member.
//   member   the member; it may be null
//   returns  a view of it
template <class T> view<T> get(const T *member)
{
    return member;
}

// The first item of a member that repeats.
//   items    the member
//   returns  a view of the item; of nothing if there is none, or if it is null
template <class T> view<T> first(const std::vector<T> &items)
{
    return items.empty() ? nullptr : &items.front();
}
template <class T> view<T> first(const std::vector<T *> &items)
{
    return items.empty() ? nullptr : items.front();
}

// A member's text, for functions that want a terminated one.
//   member     the member; it may be null or absent
//   otherwise  what to give if it is absent
//   returns    the text, valid as long as the member, or `otherwise`
inline const char *text(const view<std::string> &member, const char *otherwise = "")
{
    return member ? member->c_str() : otherwise;
}
inline const char *text(const std::string *member, const char *otherwise = "")
{
    return text(get(member), otherwise);
}

// The owner of what is made for a request: texts, numbers, enumerations and objects, to which members point.
// It lives as long as the request is needed, and is neither copied nor moved. The functions below the class
// use the newest document of their thread that hasn't ended; a document ends on the thread that made it.
class document {
public:
    document() : previous_(newest()) { newest() = this; }
    // Frees all that was made. Members that point to it are not touched: the request is gone by then, or isn't
    // used any more.
    ~document()
    {
        document **place = &newest();
        while (*place != this && *place != nullptr)
            place = &(*place)->previous_;
        if (*place == this)
            *place = previous_;
        clear();
    }
    document(const document &) = delete;
    document &operator=(const document &) = delete;

    // Makes an object that lives as long as the document.
    //   T          its class
    //   arguments  for its constructor
    //   returns    the object
    template <class T, class... Arguments> T &make(Arguments &&...arguments)
    {
        auto *const made = new owned<T>(std::forward<Arguments>(arguments)...);
        made->next = things_;
        things_ = made;
        return made->value;
    }

    // Frees all that was made, for another request.
    void clear()
    {
        while (things_ != nullptr) {
            thing *const first = things_;
            things_ = first->next;
            delete first;
        }
    }

    // The document that the functions below use.
    //   returns  the newest one of this thread; where there is none, one that lives until the thread ends
    static document &current()
    {
        if (newest() != nullptr)
            return *newest();
        static thread_local document of_thread;
        return of_thread;
    }

private:
    struct thing {
        virtual ~thing() = default;
        thing *next = nullptr;
    };
    template <class T> struct owned final : thing {
        template <class... Arguments>
        explicit owned(Arguments &&...arguments) : value(std::forward<Arguments>(arguments)...)
        {}
        T value;
    };
    static document *&newest()
    {
        static thread_local document *document = nullptr;
        return document;
    }
    document *previous_;
    thing *things_ = nullptr;
};

// Gives a member a value. What it pointed to before is left as it is: another member may share it.
//   member  the member
//   value   copied into the document in use; a text needs no terminator
inline void set(std::string *&member, std::string_view value)
{
    member = &document::current().make<std::string>(value);
}
template <class T, class U, class = std::enable_if_t<!std::is_same_v<T, std::string>>>
void set(T *&member, const U &value)
{
    member = &document::current().make<T>(value);
}

// The object of a member, made now if there is none.
//   member   the member
//   returns  its object: the one that it has, or one of the document in use
template <class T> T &make(T *&member)
{
    if (member == nullptr)
        member = &document::current().make<T>();
    return *member;
}

// Adds an object to a member that repeats.
//   items    the member
//   returns  the object, which the document in use owns
template <class T> T &add(std::vector<T *> &items)
{
    items.push_back(&document::current().make<T>());
    return *items.back();
}

} // namespace zuv
