#!/usr/bin/env bash
# The check of names finds what it is there for: lines that are in the dialect pass, each fault alone is reported.
set -euo pipefail
oHere=$(cd "$(dirname "${BASH_SOURCE[0]}")" && pwd)
oTree=$(mktemp -d)
trap 'rm -rf "$oTree"' EXIT
mkdir "$oTree/toolkit"

# check MEMBERS FIELDS ENUMERATOR TYPE: a header of these.
check()
{
    printf 'class %s : public Base\n{\npublic:\n    void Do(int nCount);\n\nprivate:\n%b\n};\n\nstruct Facts\n{\n%b\n};\n\nenum eKind\n{\n    %s = 1, // first\n};\n' \
        "$4" "$1" "$2" "$3" >"$oTree/toolkit/a.h"
    "$oHere/names.sh" "$oTree"
}

oMembers='    std::vector<int> moList;\n    unsigned int mnCount = 0; // of them\n    static int snAll;\n    Place* mpoPlace = nullptr;\n    std::function<void(int)> moTell;'
oFields='    double west = 0;\n    double east = 0;'
check "$oMembers" "$oFields" eFirst Reader || { echo "the dialect itself is refused" >&2; exit 1; }
nFaults=0
fault()
{
    local oFound
    if oFound=$(check "$@") || [ "$(grep -c '^toolkit/a.h:' <<<"$oFound")" -ne 1 ]; then
        echo "not found: $* (the check said: $oFound)" >&2
        exit 1
    fi
    nFaults=$((nFaults + 1))
}
fault '    int count;' "$oFields" eFirst Reader
fault '    std::function<void(int)> tell_;' "$oFields" eFirst Reader
fault '    unsigned char maBytes[16] = {};' "$oFields" eFirst Reader
fault "$oMembers" "$oFields\\n    int mnMore = 0;" eFirst Reader
fault "$oMembers" '    int m_count;' eFirst Reader
fault "$oMembers" "$oFields" FIRST Reader
fault "$oMembers" "$oFields" eFirst basic_reader
echo "the dialect passes; $nFaults faults were found, each alone"
