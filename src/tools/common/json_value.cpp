#include "json_value.h"

#include <algorithm>
#include <nlohmann/json.hpp>
#include <utility>

using Library = nlohmann::ordered_json;

struct JsonConversion {
    static Library toLibrary(const Json& value)
    {
        return std::visit(JsonConversion(), value.value_);
    }

    static Json fromLibrary(const Library& value)
    {
        Json result;
        if (value.is_boolean())
            result = value.get<bool>();
        else if (value.is_number_unsigned())
            result = value.get<std::uint64_t>();
        else if (value.is_number_integer())
            result = value.get<std::int64_t>();
        else if (value.is_string())
            result = value.get_ref<const std::string&>();
        else if (value.is_array())
            result = listOf(value);
        else if (value.is_object())
            result = objectOf(value);
        return result;
    }

    static Json listOf(const Library& values)
    {
        Json list = Json::array();
        for (const Library& value : values)
            list.push_back(fromLibrary(value));
        return list;
    }

    static Json objectOf(const Library& values)
    {
        std::vector<Json::Member> members;
        for (const auto& [name, value] : values.items())
            members.push_back({name, fromLibrary(value)});
        Json object;
        object.value_ = std::move(members);
        return object;
    }

    template <typename Plain>
    Library operator()(const Plain& value) const
    {
        return value;
    }

    Library operator()(const std::vector<Json>& list) const
    {
        Library result = Library::array();
        for (const Json& element : list)
            result.push_back(toLibrary(element));
        return result;
    }

    Library operator()(const std::vector<Json::Member>& members) const
    {
        Library result = Library::object();
        for (const Json::Member& member : members) // different names: no need to look for them
            result.get_ref<Library::object_t&>().emplace_back(member.name, toLibrary(member.value));
        return result;
    }
};

Json::Json(std::nullptr_t) : value_(nullptr) {}
Json::Json(bool value) : value_(value) {}
Json::Json(const char* text) : value_(std::string(text)) {}
Json::Json(std::string text) : value_(std::move(text)) {}
Json::Json(std::string_view text) : value_(std::string(text)) {}
Json::Json(std::initializer_list<Member> members) : value_(std::vector<Member>(members)) {}
Json::Json(Signed number) : value_(number.value) {}
Json::Json(Unsigned number) : value_(number.value) {}
Json::Json(const Json& other) = default;
Json::Json(Json&& other) noexcept = default;
Json& Json::operator=(const Json& other) = default;
Json& Json::operator=(Json&& other) noexcept = default;
Json::~Json() = default;

Json Json::array()
{
    Json empty;
    empty.value_ = std::vector<Json>();
    return empty;
}

bool Json::parse(const std::string& text, Json& value)
{
    const Library parsed = Library::parse(text, nullptr, false);
    if (parsed.is_discarded())
        return false;
    value = JsonConversion::fromLibrary(parsed);
    return true;
}

Json& Json::operator[](std::string_view name)
{
    if (isNull())
        value_ = std::vector<Member>();
    auto& all = std::get<std::vector<Member>>(value_);
    const auto found = std::find_if(all.begin(), all.end(),
                                    [&](const Member& member) { return member.name == name; });
    if (found != all.end())
        return found->value;
    return all.emplace_back(Member{std::string(name), nullptr}).value;
}

const Json& Json::operator[](std::string_view name) const
{
    static const Json none;
    const auto* const all = members();
    if (all == nullptr)
        return none;
    const auto found = std::find_if(all->begin(), all->end(),
                                    [&](const Member& member) { return member.name == name; });
    return found != all->end() ? found->value : none;
}

void Json::push_back(Json element)
{
    std::get<std::vector<Json>>(value_).push_back(std::move(element));
}

bool Json::isNull() const
{
    return std::holds_alternative<std::nullptr_t>(value_);
}

const bool* Json::boolean() const
{
    return std::get_if<bool>(&value_);
}

const std::string* Json::text() const
{
    return std::get_if<std::string>(&value_);
}

const std::vector<Json>* Json::list() const
{
    return std::get_if<std::vector<Json>>(&value_);
}

const std::vector<Json::Member>* Json::members() const
{
    return std::get_if<std::vector<Member>>(&value_);
}

bool Json::operator==(std::string_view other) const
{
    return text() != nullptr && *text() == other;
}

std::string Json::dump(int indent) const
{
    return JsonConversion::toLibrary(*this).dump(indent);
}
