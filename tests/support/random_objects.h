// random_objects.h - objects of any class, filled at random and compared, from the member lists alone.
//
// The objects are managed by the context that makes them. Members of a base class now and then hold an object
// of a class derived from it. Same seed, same objects. A source that shares also puts an object in several
// places, those that are just being filled included, so that there are cycles.
#pragma once

#include <map>
#include <stdexcept>

#include <zuv_client_pro/type_ids.h>

#include "binding/registry.h"
#include "binding/traits_binary.h"
#include "support/library.h"

namespace random_objects {

class source;

// What the library made. Where memory has run out the test ends: it can't go on with nothing.
template <class T> T *made_whole(void *made)
{
    if (made == nullptr)
        throw std::runtime_error("no memory for an object");
    return static_cast<T *>(made);
}

// What can be done with an object of which only the type id is known.
struct class_row {
    void (*fill)(source &random, void *object, int depth);
    bool (*equal)(const void *one, const void *other);
};
const class_row *row_of(int type_id); // class_rows.cpp of the test

class source {
public:
    source(soap *ctx, unsigned seed, bool shares = false) : ctx_(ctx), engine_(seed), shares_(shares) {}

    std::size_t below(std::size_t limit) { return engine_() % limit; }
    bool chance(std::size_t in) { return below(in) == 0; }

    // Printable text with everything that needs an escape, and now and then more than a buffer's worth.
    std::string text()
    {
        static const char alphabet[] = "abcdefgh <>&\"'\t\n\r;]0123456789\xE9\xFC";
        std::string result(chance(400) ? 70000 : below(24), 'x');
        for (char &c : result)
            c = alphabet[below(sizeof alphabet - 1)];
        if (!result.empty() && (result.front() == ' ' || result.back() == ' '))
            result.front() = result.back() = 'a';
        return result;
    }

    // Text that the schema allows for a type that is held as text.
    std::string text_of(int type_id)
    {
        switch (type_id) {
        case SOAP_TYPE_xsd__dateTime:
            return "2026-11-21T05:06:0" + std::to_string(below(10)) + "Z";
        case SOAP_TYPE_xsd__duration:
            return "P" + std::to_string(below(400)) + "DT3H";
        case SOAP_TYPE_xsd__integer:
        case SOAP_TYPE_xsd__nonNegativeInteger:
        case SOAP_TYPE_xsd__positiveInteger:
            return std::to_string(1 + below(1000000));
        case SOAP_TYPE_ns1__swaRef:
            return "cid:part" + std::to_string(below(10));
        default:
            return text();
        }
    }

    // A value of the type that is in another place already, now and then; else null.
    template <class T> T *again(int type_id)
    {
        const std::vector<void *> &made = made_[type_id];
        return shares_ && !made.empty() && chance(3) ? static_cast<T *>(made[below(made.size())]) : nullptr;
    }
    // Lets a value be in other places, an object only where its very class is asked for: a reference cannot say
    // that the class is a derived one.
    void lend(int type_id, void *value) { made_[type_id].push_back(value); }

    // An object of the class, or now and then of one derived from it.
    template <class T> T *object(int depth)
    {
        if (T *shared = again<T>(binding::traits<T>::type_id))
            return shared;
        const binding::class_ops *ops = chance(2) ? derived(binding::ops_of<T>) : &binding::ops_of<T>;
        void *made = made_whole<void>(soap_instantiate(ctx_, ops->type_id, nullptr, nullptr, nullptr));
        if (ops == &binding::ops_of<T>)
            lend(ops->type_id, made);
        row_of(ops->type_id)->fill(*this, made, depth);
        return static_cast<T *>(made);
    }

    soap *ctx() { return ctx_; }

private:
    const binding::class_ops *derived(const binding::class_ops &base)
    {
        for (int tries = 0; tries < 40; ++tries) {
            const binding::type_entry *entry = binding::type_entry_of(1 + static_cast<int>(below(580)));
            if (entry && entry->ops && binding::class_descends(entry->ops, &base))
                return entry->ops;
        }
        return &base;
    }

    soap *ctx_;
    std::mt19937 engine_;
    bool shares_;
    std::map<int, std::vector<void *>> made_;
};

template <class T> void fill(source &random, T &object, int depth);
template <class T> bool equal(const T &one, const T &other);

template <class V> void fill_new(source &random, V &value, int type_id, int depth);

template <class V> void fill_value(source &random, V &value, int type_id, int depth)
{
    if constexpr (std::is_pointer_v<V> &&
                  (std::is_same_v<V, xsd__base64Binary *> || !std::is_class_v<std::remove_pointer_t<V>> ||
                   std::is_same_v<V, std::string *>)) {
        const int kind = std::is_same_v<V, std::string *> ? SOAP_TYPE_xsd__string : type_id;
        value = random.again<std::remove_pointer_t<V>>(kind);
        if (value == nullptr) {
            fill_new(random, value, type_id, depth);
            random.lend(kind, value);
        }
    } else {
        fill_new(random, value, type_id, depth);
    }
}

template <class V> void fill_new(source &random, V &value, int type_id, int depth)
{
    using namespace binding;
    if constexpr (std::is_same_v<V, std::string>)
        value = random.text_of(type_id);
    else if constexpr (std::is_same_v<V, bool>)
        value = random.chance(2);
    else if constexpr (std::is_enum_v<V>)
        value = static_cast<V>(random.below(enum_traits<V>::count));
    else if constexpr (std::is_same_v<V, double>)
        value = static_cast<double>(random.below(1000000)) / 64.0;
    else if constexpr (std::is_arithmetic_v<V>)
        value = static_cast<V>(random.below(1000000)) - 500000;
    else if constexpr (std::is_same_v<V, xsd__base64Binary *>) {
        value = made_whole<xsd__base64Binary>(soap_instantiate(random.ctx(), 10, nullptr, nullptr, nullptr));
        value->size = static_cast<int>(1 + random.below(60));
        value->content = made_whole<unsigned char>(soap_block_alloc(random.ctx(), 64));
        for (int i = 0; i < value->size; ++i)
            value->content[i] = static_cast<unsigned char>(random.below(256));
    } else if constexpr (std::is_pointer_v<V>) {
        using target = std::remove_pointer_t<V>;
        if constexpr (std::is_same_v<target, std::string>) {
            value = made_whole<target>(soap_instantiate(random.ctx(), 8, nullptr, nullptr, nullptr));
            fill_value(random, *value, type_id, depth);
        } else if constexpr (std::is_class_v<target>) {
            value = random.object<target>(depth - 1);
        } else {
            value = made_whole<target>(soap_block_alloc(random.ctx(), sizeof(target)));
            *value = target{};
            fill_value(random, *value, type_id, depth);
        }
    }
}

// The places compared so far, if sharing counts: what is one on the one side is one on the other.
struct sharing {
    std::map<const void *, const void *> there, back;
};
inline sharing *compared = nullptr;

// Whether the pair was met before, as the same pair (`same`) or one of them with another.
inline bool met(const void *one, const void *other, bool &same)
{
    same = true;
    if (compared == nullptr)
        return false;
    const auto [there, first] = compared->there.emplace(one, other);
    const auto [back, also_first] = compared->back.emplace(other, one);
    same = there->second == other && back->second == one;
    return !first || !also_first;
}

template <class V> bool equal_value(const V &one, const V &other)
{
    if constexpr (std::is_pointer_v<V>) {
        bool same;
        if (one && other && met(one, other, same))
            return same;
    }
    if constexpr (std::is_same_v<V, xsd__base64Binary *>) {
        if (!one || !other)
            return one == other;
        return one->size == other->size &&
               std::memcmp(one->content, other->content, static_cast<std::size_t>(one->size)) == 0;
    } else if constexpr (std::is_pointer_v<V>) {
        using target = std::remove_pointer_t<V>;
        if (!one || !other)
            return one == other;
        if constexpr (std::is_class_v<target> && !std::is_same_v<target, std::string>)
            return one->soap_type() == other->soap_type() && row_of(one->soap_type())->equal(one, other);
        else
            return equal_value(*one, *other);
    } else {
        return one == other;
    }
}

template <class V> bool equal_value(const std::vector<V> &one, const std::vector<V> &other)
{
    const auto alike = [](const V &each, const V &its_like) { return equal_value(each, its_like); };
    return std::equal(one.begin(), one.end(), other.begin(), other.end(), alike);
}

template <class V>
void fill_member(source &random, V &member, binding::occurs how, int type_id, std::size_t, int depth)
{
    constexpr bool object = std::is_pointer_v<V> && std::is_class_v<std::remove_pointer_t<V>> &&
                            !std::is_same_v<std::remove_pointer_t<V>, std::string>;
    if (how == binding::occurs::optional && (!random.chance(3) || (object && depth <= 0)))
        return;
    fill_value(random, member, type_id, depth);
}

template <class V>
void fill_member(source &random, std::vector<V> &member, binding::occurs, int type_id, std::size_t minimum,
                 int depth)
{
    const std::size_t count = minimum + (depth > 0 && random.chance(3) ? random.below(3) : 0);
    member.resize(count);
    for (V &item : member)
        fill_value(random, item, type_id, depth);
}

template <class V> void fill_attribute(source &random, V &member, bool required)
{
    if (required || random.chance(2))
        fill_new(random, member, 0, 0); // an attribute has no identity
}

template <class T> void fill(source &random, T &object, int depth)
{
    using traits = binding::traits<T>;
    if constexpr (!std::is_void_v<typename traits::base>)
        fill<typename traits::base>(random, object, depth);
    std::apply([&](const auto &...row) { (fill_attribute(random, object.*row.member, row.required), ...); },
               traits::attributes);
    if constexpr (traits::text != nullptr)
        object.*traits::text = random.text();
    std::apply(
        [&](const auto &...row) {
            (fill_member(random, object.*row.member, row.how, row.item_type, row.minimum, depth), ...);
        },
        traits::elements);
}

template <class T> bool equal(const T &one, const T &other)
{
    using traits = binding::traits<T>;
    if constexpr (!std::is_void_v<typename traits::base>) {
        if (!equal<typename traits::base>(one, other))
            return false;
    }
    if constexpr (traits::text != nullptr) {
        if (one.*traits::text != other.*traits::text)
            return false;
    }
    return std::apply(
        [&](const auto &...row) { return (... && equal_value(one.*row.member, other.*row.member)); },
        std::tuple_cat(traits::attributes, traits::elements));
}

template <class T>
inline constexpr class_row row = {
    [](source &random, void *object, int depth) { fill(random, *static_cast<T *>(object), depth); },
    [](const void *one, const void *other) {
        return equal(*static_cast<const T *>(one), *static_cast<const T *>(other));
    }};

} // namespace random_objects
