// Ordered map from byte-string keys to shared values of any type. It carries a weight's values and
// a model's environment parameters. Threads: like a standard container; concurrent reads are safe,
// writes need the engine's lock.
#pragma once

#include <cstddef>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <utility>

namespace MORVA::CONTAINERS {

// Base that lets values of different types sit in one map and be got back by a checked down-cast.
class MapObject {
public:
    MapObject() = default;
    MapObject(MapObject const&) = delete;
    MapObject& operator=(MapObject const&) = delete;
    virtual ~MapObject() = default;
};

// One value of type T, shared with everyone who asked for it.
template <class T>
class Any final : public MapObject {
public:
    explicit Any(std::shared_ptr<T> value) : value_(std::move(value)) {}

    std::shared_ptr<T> const& value() const { return value_; }

private:
    std::shared_ptr<T> value_;
};

// What insert does with a key that is already there.
enum class InsertMode : int { keep = 0, replace = 1 };

class AnyMap {
public:
    using Values = std::map<std::string, std::shared_ptr<MapObject>, std::less<>>;

    // The stored value when the key was absent, empty when it was present: the entry is then left
    // as it is (`keep`) or replaced (`replace`; holders of the old value keep it).
    template <class T>
    std::shared_ptr<T> insert(std::string const& key, T value, InsertMode mode) {
        auto const found = values_.find(key);
        if (found != values_.end() && mode == InsertMode::keep) return nullptr;

        auto stored = std::make_shared<T>(std::move(value));
        auto object = std::make_shared<Any<T>>(stored);
        if (found != values_.end()) {
            found->second = std::move(object);
            return nullptr;
        }
        values_.emplace(key, std::move(object));
        return stored;
    }

    // Empty when the key is absent or holds another type.
    template <class T>
    std::shared_ptr<T> find(std::string_view key) const {
        auto const found = values_.find(key);
        if (found == values_.end()) return nullptr;
        auto const* const object = dynamic_cast<Any<T> const*>(found->second.get());
        return object != nullptr ? object->value() : nullptr;
    }

    bool contains(std::string_view key) const { return values_.find(key) != values_.end(); }
    bool empty() const { return values_.empty(); }
    std::size_t size() const { return values_.size(); }
    void clear() { values_.clear(); }

    Values::const_iterator begin() const { return values_.begin(); }
    Values::const_iterator end() const { return values_.end(); }

private:
    Values values_;
};

}  // namespace MORVA::CONTAINERS
