// JSON as the companion tools build, print and read it.
//
// A small value of our own around the JSON library, whose header takes seconds to compile: only
// json_value.cpp includes it.
//
//     Json report = {{"file", shown(name)}, {"size", size}};
//     report["entries"] = Json::array();
//     report["entries"].push_back({{"name", "bin/a"}, {"mode", nullptr}});
#pragma once

#include <concepts>
#include <cstddef>
#include <cstdint>
#include <initializer_list>
#include <string>
#include <string_view>
#include <variant>
#include <vector>

/// A JSON value. The members of an object keep the order in which they were added. Texts must be
/// valid UTF-8: those of shown() and jsonText() are.
class Json {
public:
    struct Member;

    // NOLINTBEGIN(google-explicit-constructor): a value is made of what it holds, as in JSON
    Json(std::nullptr_t = nullptr);
    Json(bool value);
    Json(const char* text);
    Json(std::string text);
    Json(std::string_view text);
    /// An object of these members, with different names.
    Json(std::initializer_list<Member> members);
    template <std::integral Number>
    Json(Number number) : Json(widened(number))
    {
    }
    // NOLINTEND(google-explicit-constructor)
    Json(const Json& other);
    Json(Json&& other) noexcept;
    Json& operator=(const Json& other);
    Json& operator=(Json&& other) noexcept;
    ~Json();

    /// A list of nothing.
    [[nodiscard]] static Json array();

    /// Reads `text` into `value`; false when it is no JSON of the kinds that are written here.
    [[nodiscard]] static bool parse(const std::string& text, Json& value);

    /// The member `name` of an object, or of null, which becomes one; null if it is new.
    Json& operator[](std::string_view name);
    /// The same; null if there is none.
    const Json& operator[](std::string_view name) const;

    /// Adds `element` to a list.
    void push_back(Json element); // NOLINT(readability-identifier-naming): as of other lists

    [[nodiscard]] bool isNull() const;
    /// The value if it is of this kind, else null.
    [[nodiscard]] const bool* boolean() const;
    [[nodiscard]] const std::string* text() const;
    [[nodiscard]] const std::vector<Json>* list() const;
    [[nodiscard]] const std::vector<Member>* members() const;

    /// True if it is the text `other`.
    bool operator==(std::string_view other) const;

    /// As JSON: on one line, or indented by `indent`.
    [[nodiscard]] std::string dump(int indent = -1) const;

private:
    friend struct JsonConversion; // to and from the library's values

    // What the template above delegates to: here, where Member is incomplete, nothing can be made.
    struct Signed {
        std::int64_t value;
    };
    struct Unsigned {
        std::uint64_t value;
    };
    explicit Json(Signed number);
    explicit Json(Unsigned number);

    template <std::integral Number>
    static auto widened(Number number)
    {
        if constexpr (std::signed_integral<Number>)
            return Signed{number};
        else
            return Unsigned{number};
    }

    std::variant<std::nullptr_t, bool, std::int64_t, std::uint64_t, std::string, std::vector<Json>,
                 std::vector<Member>>
        value_;
};

/// A member of an object.
struct Json::Member {
    std::string name;
    Json value;
};
