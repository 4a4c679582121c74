#include "fault/sweep.h"

#include <cstdlib>
#include <fstream>
#include <iostream>
#include <sstream>

namespace fault {

namespace {

using counts = std::map<std::string, size_t>;

/** The exported functions, read from the version script. */
std::set<std::string> exported_functions() {
    std::ifstream in(KOVA_EXPORTS);
    std::set<std::string> names;
    for (std::string word; in >> word;) {
        const bool is_table = word.front() == 'g'; // nothing to call
        if (word.back() == ';' && word != "*;" && word != "};" && !is_table) {
            names.insert(word.substr(0, word.size() - 1));
        }
    }
    return names;
}

std::string function_of(const std::string &name) {
    return name.substr(0, name.find('/'));
}

/** The recorded numbers of points: lines "NUMBER SCENARIO". */
counts recorded_points() {
    std::ifstream in(KOVA_FAULT_POINTS);
    counts points;
    size_t number = 0;
    for (std::string name; in >> number >> std::ws && std::getline(in, name);) {
        points[name] = number;
    }
    return points;
}

/** What is wrong with the number of points that a scenario met; empty when nothing is. */
std::string complaint(const scenario &one, size_t met) {
    static const counts recorded = recorded_points();
    const std::string refresh = "; when that is meant, ./test fault --refresh records it in tests/fault/points.txt";
    const auto found = recorded.find(one.name);
    if (one.is_pure != (met == 0)) {
        return one.name + (met == 0 ? " meets no point at which it could fail" : " is called pure, but can fail");
    }
    if (found == recorded.end()) {
        return one.name + " is not recorded: " + std::to_string(met) + " points" + refresh;
    }
    const std::string numbers = std::to_string(met) + " points, recorded are " + std::to_string(found->second);
    if (met > found->second) {
        std::cout << "fault points of " << one.name << ": meets " << numbers << refresh << "\n";
    }
    if (met < found->second) {
        return one.name + " meets " + numbers + refresh;
    }
    return "";
}

void show_points(const scenario &one, const report &clean) {
    std::cout << "fault points of " << one.name << ": " << clean.met.size() << "\n";
    for (size_t i = 0; getenv("KOVA_FAULT_SHOW") != nullptr && i < clean.met.size(); ++i) {
        std::cout << "    " << i + 1 << " " << clean.met[i] << "\n";
    }
}

class function_sweep : public ::testing::Test {
public:
    explicit function_sweep(const scenario &one) : one_(one) {}

    void TestBody() override {
        const report clean = run(one_, {});
        ASSERT_EQ("", clean.crash) << one_.name << " without any failure";
        EXPECT_EQ(texts{}, clean.wrong) << one_.name << " without any failure";
        show_points(one_, clean);
        const texts wrong = sweep(one_, clean); // before anything here fails: its processes would take that for theirs
        EXPECT_EQ("", complaint(one_, clean.met.size()));
        for (const std::string &line : wrong) {
            ADD_FAILURE() << line;
        }
    }

private:
    const scenario &one_;
};

class completeness : public ::testing::Test {
public:
    void TestBody() override {
        std::set<std::string> swept;
        std::set<std::string> named;
        for (const scenario &one : scenarios()) {
            swept.insert(function_of(one.name));
            EXPECT_TRUE(named.insert(one.name).second) << one.name << " stands twice in tests/fault/scenarios.cpp";
        }
        const std::set<std::string> exported = exported_functions();
        EXPECT_FALSE(exported.empty());
        for (const std::string &function : exported) {
            EXPECT_TRUE(swept.count(function))
                << function << " is exported and has no scenario in tests/fault/scenarios.cpp";
        }
        for (const std::string &function : swept) {
            EXPECT_TRUE(exported.count(function)) << function << " has a scenario and is not exported";
        }
        for (const auto &[name, number] : recorded_points()) {
            EXPECT_TRUE(named.count(name)) << name << " is recorded in tests/fault/points.txt and has no scenario";
        }
    }
};

std::string test_name(std::string name) {
    std::replace_if(
        name.begin(), name.end(), [](unsigned char c) { return isalnum(c) == 0; }, '_');
    return name;
}

void register_tests() {
    ::testing::RegisterTest("fault", "every_exported_function_has_a_scenario", nullptr, nullptr, __FILE__, __LINE__,
                            []() -> ::testing::Test * { return new completeness; });
    for (const scenario &one : scenarios()) {
        ::testing::RegisterTest("fault", test_name(one.name).c_str(), nullptr, nullptr, __FILE__, __LINE__,
                                [&one]() -> ::testing::Test * { return new function_sweep(one); });
    }
}

/** Prints what tests/fault/points.txt records. */
int print_points() {
    for (const scenario &one : scenarios()) {
        const report clean = run(one, {});
        if (!clean.crash.empty()) {
            std::cerr << one.name << " " << clean.crash << "\n";
            return 1;
        }
        std::cout << clean.met.size() << " " << one.name << "\n";
    }
    return 0;
}

} // namespace

} // namespace fault

int main(int argc, char **argv) {
    if (getenv("KOVA_BOX") == nullptr) {
        fprintf(stderr, "These tests write to /etc and /run: run them inside the box, as ./test does.\n");
        return 2;
    }
    ::testing::InitGoogleTest(&argc, argv);
    if (argc == 2 && std::string(argv[1]) == "--points") {
        return fault::print_points();
    }
    fault::register_tests();
    return RUN_ALL_TESTS();
}
