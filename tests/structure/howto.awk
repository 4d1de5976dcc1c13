# Makes one program of the blocks of code in a page: each runs in a scope of its own, in the order of the page. Fails
# when there are other than `wanted` blocks.
# Usage: awk -v wanted=20 -f howto.awk PAGE >PROGRAM
BEGIN {
    print "#include <krv/krv.h>\n#include <algorithm>\n#include <cmath>\n#include <iostream>\n#include <numeric>\n"
    print "template <class... Values> void Use(const Values&...) {}\n"
    print "int main()\ntry\n{\n    const char* pAnswer = \"\";\n    try\n    {"
}
/^## / { title = $0; sub(/^## /, "", title) }
/^```cpp/ { printf "pAnswer = \"%s\";\n{\n", title; inside = 1; ++count; next }
/^```/ && inside { print "}"; inside = 0; next }
inside { print }
END {
    print "    }\n    catch (const std::exception& oError)\n    {"
    print "        std::cerr << pAnswer << \": \" << oError.what() << \"\\n\";\n        return 1;\n    }"
    printf "    std::cout << \"%d answers hold\\n\";\n}\ncatch (...)\n{\n    return 1;\n}\n", count
    exit count != wanted
}
