// The directory into which a package is extracted, as a model: what is there after each step.
//
// Follows the installer's steps, backups included, to know whether each of them would work. Of a
// step that would not, the code is returned; what it was to make is there from then on, so that one
// fault is not found again in every entry that builds on it.
#pragma once

#include <cstddef>
#include <map>
#include <memory>
#include <string>
#include <string_view>

class ExtractionModel {
public:
    /// More nodes than any package that is none made to fill the memory needs.
    static constexpr std::size_t MostNodes = 1000000;

    ExtractionModel();

    /// Makes every directory of `path` that is missing. Returns the code of a finding, or none.
    std::string_view makeDirectories(std::string_view path);

    /// Writes a file, whose old content is backed up. Returns the code of a finding, or none.
    std::string_view writeFile(std::string_view path);

    [[nodiscard]] bool hasFile(std::string_view path) const;

    /// True once there was no room for a node: what is found from then on means nothing.
    [[nodiscard]] bool isFull() const { return count_ >= MostNodes; }

private:
    struct Node {
        Node* parent = nullptr;
        bool isFile = false;
        bool isDirectory = false;
        std::map<std::string, std::unique_ptr<Node>, std::less<>> children;
    };

    Node* enter(Node* place, std::string_view component);
    Node* child(Node* place, std::string_view name);
    std::string_view backUp(Node* parent, const std::string& name);
    static bool hasEntries(const Node& node);
    static void moveInto(Node& from, Node& to);

    Node root_;
    std::size_t count_ = 0;
};
