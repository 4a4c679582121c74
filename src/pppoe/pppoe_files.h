/**
 * @file
 * The PPP client's files and the user name in them.
 */
#pragma once

namespace kova {

inline constexpr char kPppoeConf[] = "/etc/ppp/pppoe.conf";
inline constexpr char kPapSecrets[] = "/etc/ppp/pap-secrets";

/** The user name as both files hold it: in single quotes, for a shell. One that gets too long is cut. */
class quoted_user {
public:
    explicit quoted_user(const char *szUser);
    [[nodiscard]] const char *c_str() const { return text_; }

private:
    static constexpr int kRoom = 512;
    void append(const char *bytes);

    char text_[kRoom];
    int length_ = 0;
};

/** Takes the quotes of a shell off a text, in place: 'a'"'"'b' becomes a'b. */
void unquote(char *text);

/** Where the quoted text ends that a text begins with, or at the first of some other bytes outside quotes. */
[[nodiscard]] char *end_of_quoted(char *text, const char *ends);

} // namespace kova
