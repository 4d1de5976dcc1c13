# Reads sources that are laid out by .clang-format and prints every name that is not in the dialect of the project:
# file:line: what is wrong. Fails when there is one. The dialect:
# - types and functions: UpperCamel; what the contract spells otherwise stands in the list below;
# - enumerators: e and UpperCamel;
# - data members of classes: m, then o (objects), n (numbers), b (flags), p or po (what points or owns), e (enumerators),
#   then UpperCamel. Fields of a plain struct either all so or all bare: never both in one.
# Usage: awk -f names.awk FILE...

BEGIN {
    # Names that are given: by the contract, and the markers of a codestream by their standard.
    split("KRV_XMLUtil Marker", names, " ");
    for (n in names)
        given[names[n]] = 1;
}

function complain(text)
{
    printf "%s:%d: %s\n", FILENAME, FNR, text;
    bad = 1;
}

function indent(line)
{
    match(line, /[^ ]/);
    return RSTART - 1;
}

# The name that a declaration without initialiser ends with.
function declared(text)
{
    while (gsub(/<[^<>]*>/, "", text))
        ;
    sub(/ *(=|\{).*$/, "", text);
    sub(/ *;.*$/, "", text);
    if (text ~ /\(/)
        return "";
    gsub(/ *\[[^\]]*\]/, "", text);
    sub(/ *: *[0-9]+ *$/, "", text);
    return match(text, /[A-Za-z_][A-Za-z_0-9]*$/) ? substr(text, RSTART) : "";
}

function checkMember(name)
{
    if (name ~ /^m(o|po|n|b|p|e)[A-Z][A-Za-z0-9]*$/) {
        prefixed[depth] = name;
    } else if (kind[depth] == "class" || name !~ /^[a-z][A-Za-z0-9]*$/ || name ~ /^m[a-z]?[A-Z]/ || name ~ /_$/) {
        complain("the member " name " of " type[depth] " has not the prefix of its kind");
        return;
    } else
        bare[depth] = name;
    if (prefixed[depth] != "" && bare[depth] != "" && !told[depth]) {
        complain(type[depth] " has fields of two dialects: " prefixed[depth] " and " bare[depth]);
        told[depth] = 1;
    }
}

FNR == 1 { depth = 0; pending = 0; ++files }

/^ *\/\// || /^#/ || /^$/ { next }

{ sub(/alignas\([^)]*\) */, "") }

# The head of a type, which may be of several lines; the brace stands alone below it.
/^ *(template <.*> *)?(class|struct|enum|enum class|union) [^;]*$/ && !/[({]/ || /^ *(class|struct) [A-Za-z_0-9 ]*( final)?( : .*)?$/ {
    head = $0;
    sub(/^ *(template <.*> *)?/, "", head);
    pendingKind = head ~ /^enum/ ? "enum" : head ~ /^class/ ? "class" : "struct";
    sub(/^(enum class|enum|class|struct|union) */, "", head);
    sub(/^(KRV_[A-Z_]*API|\[\[[^\]]*\]\]) */, "", head);
    pendingName = match(head, /^[A-Za-z_0-9:]+/) ? substr(head, 1, RLENGTH) : "";
    sub(/^.*::/, "", pendingName);
    pendingIndent = indent($0);
    pending = 1;
    if (pendingName != "" && pendingName !~ /^[A-Z][A-Za-z0-9]*$/ && !(pendingKind == "enum" && pendingName ~ /^e[A-Z]/) &&
        !(pendingName in given))
        complain("the type " pendingName " is not in UpperCamel");
    next;
}

pending && /^ *\{$/ && indent($0) == pendingIndent {
    ++depth;
    kind[depth] = pendingKind;
    type[depth] = pendingName;
    at[depth] = pendingIndent;
    prefixed[depth] = bare[depth] = "";
    told[depth] = pending = 0;
    next;
}

depth > 0 && /^ *\};?/ && indent($0) == at[depth] { --depth; next }

depth == 0 || indent($0) != at[depth] + 4 { next }

kind[depth] == "enum" {
    name = $1;
    sub(/[,=].*$/, "", name);
    if (name !~ /^e[A-Z]/ && !(type[depth] in given))
        complain("the enumerator " name " of " type[depth] " does not begin with e");
    next;
}

/^ *(using|friend|static|typedef|enum|class|struct|union|template|return|if|for|constexpr|inline|extern) / { next }

/^ *[A-Za-z_].*;/ {
    text = $0;
    sub(/ *\/\/.*$/, "", text);
    if (text !~ /;$/)
        next;
    name = declared(text);
    if (name != "" && text ~ /[A-Za-z_0-9>*&:] *[*& ]/ && name != "default" && name != "delete" && name != "override" && name != "const" && name != "operator")
        checkMember(name);
}

END {
    if (files < 1) {
        print "no sources were given";
        bad = 1;
    }
    if (!bad)
        print files " files keep the dialect";
    exit bad;
}
