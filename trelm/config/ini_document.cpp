// Line-preserving INI parsing and writing for the configuration manager.
#include <trelm/config/ini_document.h>

#include <algorithm>
#include <utility>

namespace TrelmSDK {

namespace {

bool isBlank(char c) {
    return c == ' ' || c == '\t';
}

std::string_view trim(std::string_view s) {
    while (!s.empty() && isBlank(s.front())) s.remove_prefix(1);
    while (!s.empty() && isBlank(s.back())) s.remove_suffix(1);
    return s;
}

char lower(char c) {
    return (c >= 'A' && c <= 'Z') ? static_cast<char>(c - 'A' + 'a') : c;
}

bool equalNoCase(std::string_view a, std::string_view b) {
    return a.size() == b.size() && std::equal(a.begin(), a.end(), b.begin(),
                                              [](char x, char y) { return lower(x) == lower(y); });
}

bool hasLineBreak(std::string_view s) {
    return s.find_first_of("\r\n") != std::string_view::npos;
}

std::string unquote(std::string_view value) {
    value = trim(value);
    if (value.size() >= 2 && value.front() == '"' && value.back() == '"')
        value = value.substr(1, value.size() - 2);
    return std::string(value);
}

} // namespace

void IniDocument::Parse(std::string_view text) {
    lines_.clear();
    issues_.clear();
    crlf_ = false;
    bom_ = false;
    if (text.starts_with("\xEF\xBB\xBF")) {
        bom_ = true;
        text.remove_prefix(3);
    }
    const auto firstBreak = text.find('\n');
    if (firstBreak != std::string_view::npos && firstBreak > 0 && text[firstBreak - 1] == '\r')
        crlf_ = true;

    std::string currentSection;
    std::size_t lineNumber = 0;
    while (!text.empty()) {
        const auto end = text.find('\n');
        std::string_view raw = text.substr(0, end);
        text = end == std::string_view::npos ? std::string_view() : text.substr(end + 1);
        if (!raw.empty() && raw.back() == '\r') raw.remove_suffix(1);
        ++lineNumber;

        Line line;
        line.raw = std::string(raw);
        const std::string_view t = trim(raw);
        if (t.empty() || t.front() == ';' || t.front() == '#') {
            lines_.push_back(std::move(line));
            continue;
        }
        if (t.front() == '[') {
            const auto close = t.find(']');
            const std::string_view name =
                close == std::string_view::npos ? std::string_view() : trim(t.substr(1, close - 1));
            if (close == std::string_view::npos || name.empty()) {
                issues_.push_back({lineNumber, close == std::string_view::npos
                                                   ? "section header without a closing ']'"
                                                   : "section header without a name"});
            } else {
                const std::string_view rest = trim(t.substr(close + 1));
                if (!rest.empty() && rest.front() != ';' && rest.front() != '#')
                    issues_.push_back({lineNumber, "text after the section header is ignored"});
                line.kind = LineKind::Section;
                line.name = std::string(name);
                currentSection = line.name;
            }
            lines_.push_back(std::move(line));
            continue;
        }
        const auto eq = raw.find('=');
        const std::string_view key =
            eq == std::string_view::npos ? std::string_view() : trim(raw.substr(0, eq));
        if (key.empty()) {
            issues_.push_back({lineNumber, eq == std::string_view::npos
                                               ? "line is neither a section, a key nor a comment"
                                               : "key without a name"});
            lines_.push_back(std::move(line));
            continue;
        }
        line.kind = LineKind::Key;
        line.name = std::string(key);
        line.section = currentSection;
        std::size_t valueStart = eq + 1;
        while (valueStart < raw.size() && isBlank(raw[valueStart])) ++valueStart;
        line.valueStart = valueStart;
        lines_.push_back(std::move(line));
    }
}

std::string IniDocument::Serialize() const {
    std::string out;
    if (bom_) out += "\xEF\xBB\xBF";
    for (const Line& line : lines_) {
        out += line.raw;
        if (crlf_) out.push_back('\r');
        out.push_back('\n');
    }
    return out;
}

const IniDocument::Line* IniDocument::findKey(std::string_view section,
                                              std::string_view key) const {
    for (const Line& line : lines_)
        if (line.kind == LineKind::Key && equalNoCase(line.section, section) &&
            equalNoCase(line.name, key))
            return &line;
    return nullptr;
}

IniDocument::Line* IniDocument::findKey(std::string_view section, std::string_view key) {
    return const_cast<Line*>(std::as_const(*this).findKey(section, key));
}

bool IniDocument::HasSection(std::string_view section) const {
    if (section.empty())
        return std::any_of(lines_.begin(), lines_.end(), [](const Line& l) {
            return l.kind == LineKind::Key && l.section.empty();
        });
    return std::any_of(lines_.begin(), lines_.end(), [&](const Line& l) {
        return l.kind == LineKind::Section && equalNoCase(l.name, section);
    });
}

bool IniDocument::HasKey(std::string_view section, std::string_view key) const {
    return findKey(section, key) != nullptr;
}

std::optional<std::string> IniDocument::Get(std::string_view section, std::string_view key) const {
    const Line* line = findKey(section, key);
    if (!line) return std::nullopt;
    return unquote(std::string_view(line->raw).substr(line->valueStart));
}

std::string IniDocument::formatValue(std::string_view value) {
    const bool needsQuotes =
        !value.empty() && (isBlank(value.front()) || isBlank(value.back()) ||
                           (value.size() >= 2 && value.front() == '"' && value.back() == '"'));
    std::string text;
    text.reserve(value.size() + 2);
    if (needsQuotes) text.push_back('"');
    text.append(value);
    if (needsQuotes) text.push_back('"');
    return text;
}

bool IniDocument::Set(std::string_view section, std::string_view key, std::string_view value) {
    if (!IsValidKeyName(key) || (!section.empty() && !IsValidSectionName(section)) ||
        hasLineBreak(value))
        return false;
    if (Line* line = findKey(section, key)) {
        line->raw = line->raw.substr(0, line->valueStart) + formatValue(value);
        return true;
    }

    Line added;
    added.kind = LineKind::Key;
    added.name = std::string(key);
    added.section = std::string(section);
    added.raw = added.name + "=";
    added.valueStart = added.raw.size();
    added.raw += formatValue(value);

    // The new key goes after the last key of the section's first block, or right after its header.
    std::size_t insertAt = 0;
    bool found = section.empty();
    std::size_t i = 0;
    if (!section.empty()) {
        for (; i < lines_.size(); ++i)
            if (lines_[i].kind == LineKind::Section && equalNoCase(lines_[i].name, section)) {
                found = true;
                insertAt = ++i;
                break;
            }
    }
    if (found) {
        for (; i < lines_.size() && lines_[i].kind != LineKind::Section; ++i)
            if (lines_[i].kind == LineKind::Key) insertAt = i + 1;
        lines_.insert(lines_.begin() + static_cast<std::ptrdiff_t>(insertAt), std::move(added));
        return true;
    }

    if (!lines_.empty() && !trim(lines_.back().raw).empty()) lines_.push_back(Line{});
    Line header;
    header.kind = LineKind::Section;
    header.name = std::string(section);
    header.raw = "[" + header.name + "]";
    lines_.push_back(std::move(header));
    lines_.push_back(std::move(added));
    return true;
}

bool IniDocument::Remove(std::string_view section, std::string_view key) {
    const auto it = std::find_if(lines_.begin(), lines_.end(), [&](const Line& l) {
        return l.kind == LineKind::Key && equalNoCase(l.section, section) &&
               equalNoCase(l.name, key);
    });
    if (it == lines_.end()) return false;
    lines_.erase(it);
    return true;
}

std::vector<std::string> IniDocument::Sections() const {
    std::vector<std::string> names;
    for (const Line& line : lines_) {
        if (line.kind != LineKind::Section) continue;
        if (std::none_of(names.begin(), names.end(),
                         [&](const std::string& n) { return equalNoCase(n, line.name); }))
            names.push_back(line.name);
    }
    return names;
}

std::vector<std::string> IniDocument::Keys(std::string_view section) const {
    std::vector<std::string> names;
    for (const Line& line : lines_) {
        if (line.kind != LineKind::Key || !equalNoCase(line.section, section)) continue;
        if (std::none_of(names.begin(), names.end(),
                         [&](const std::string& n) { return equalNoCase(n, line.name); }))
            names.push_back(line.name);
    }
    return names;
}

bool IniDocument::IsValidSectionName(std::string_view name) {
    return !name.empty() && trim(name).size() == name.size() && !hasLineBreak(name) &&
           name.find(']') == std::string_view::npos;
}

bool IniDocument::IsValidKeyName(std::string_view name) {
    return !name.empty() && trim(name).size() == name.size() && !hasLineBreak(name) &&
           name.find('=') == std::string_view::npos && name.front() != ';' && name.front() != '#' &&
           name.front() != '[';
}

} // namespace TrelmSDK
