# check-includes.awk: prints which folder includes which, and fails on a direction that is not
# allowed, on a cycle between platform services, and on an include not written from the root.
#
#   git ls-files '*.h' '*.cpp' | awk -f scripts/check-includes.awk
#
# Each folder of platform/ counts as one, and otherwise each folder at the top.

BEGIN {
    # What a folder may include besides itself. "platform" stands for every platform service.
    may["AppRegistry"] = "platform"
    may["Zephrin"] = "platform AppRegistry"
    may["zpd"] = "platform AppRegistry Zephrin"
    may["launcher"] = "platform"
    may["zpctl"] = "platform Zephrin"
    may["examples"] = "platform Zephrin"
    any = " tests bench fuzz "
}

{ read_file($0) }

END {
    for (edge in count) {
        split(edge, ends, SUBSEP)
        if (!allowed(ends[1], ends[2]))
            fail(example[edge] ": " ends[1] " must not include " ends[2])
        if (ends[1] ~ /^platform\// && ends[2] ~ /^platform\//)
            below[ends[1]] = below[ends[1]] " " ends[2]
    }
    for (service in below)
        find_cycle(service)
    print_edges()
    exit failed
}

function read_file(path,    line, target, number) {
    while ((getline line < path) > 0) {
        ++number
        if (line !~ /^[ \t]*#[ \t]*include[ \t]*"/)
            continue
        target = line
        sub(/^[^"]*"/, "", target)
        sub(/".*$/, "", target)
        if (!is_file(target))
            fail(path ":" number ": no \"" target "\" at the root of the project")
        else
            add_edge(node(path), node(target), path ":" number)
    }
    close(path)
}

function is_file(path,    line, found) {
    if (!(path in known)) {
        found = (getline line < path) >= 0
        close(path)
        known[path] = found
    }
    return known[path]
}

function node(path,    part) {
    split(path, part, "/")
    return part[1] == "platform" ? part[1] "/" part[2] : part[1]
}

function add_edge(from, to, where) {
    if (from == to)
        return
    if (!((from, to) in count))
        example[from, to] = where
    ++count[from, to]
}

function allowed(from, to,    group) {
    if (index(any, " " from " "))
        return 1
    group = to ~ /^platform\// ? "platform" : to
    if (from == "platform/value")
        return 0
    if (from ~ /^platform\//)
        return group == "platform"
    return index(" " may[from] " ", " " group " ") > 0
}

# Depth first from one service; state is 1 on the way down and 2 when done.
function find_cycle(service,    next_, n, i) {
    if (state[service] == 2)
        return
    if (state[service] == 1) {
        fail("platform services include each other in a cycle through " service)
        return
    }
    state[service] = 1
    n = split(below[service], next_, " ")
    for (i = 1; i <= n; ++i)
        find_cycle(next_[i])
    state[service] = 2
}

function print_edges(    edge, ends, sorter) {
    sorter = "sort"
    for (edge in count) {
        split(edge, ends, SUBSEP)
        printf "%-24s -> %-24s %4d\n", ends[1], ends[2], count[edge] | sorter
    }
    close(sorter)
}

function fail(text) {
    print text > "/dev/stderr"
    failed = 1
}
