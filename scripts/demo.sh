#!/bin/sh
# demo.sh [BUILD-FOLDER]: shows the daemon at work on the sample applications, in a home of its own.
# Every step prints its command as a user would type it, and is checked. Exit status 0 only if all
# of it worked; else the daemon's log is shown.
set -eu
cd "$(dirname "$0")/.."
umask 022

build=$(realpath "${1:-build/release}")
step_limit=100 # tenths of a second that anything here may take

home=
daemon=
monitor=
talk=
hold=

clean_up() {
    status=$?
    trap - EXIT INT TERM
    for process in $monitor $talk $hold $daemon; do
        kill "$process" 2>/dev/null || true
        wait "$process" 2>/dev/null || true
    done
    [ -z "$home" ] || rm -rf "$home"
    exit $status
}
trap clean_up EXIT
trap 'exit 130' INT
trap 'exit 143' TERM

# Not below TMPDIR: the path of a socket must be short.
home=$(mktemp -d /tmp/zpd-demo.XXXXXX)
# As root each plug-in is a user of its own, who must get through to its bundle and container.
chmod 711 "$home"
log=$home/zpd.log
output=$home/output
PATH=$build/bin:$PATH
export ZEPHRIN_HOME="$home/home"
export PATH
unset ZEPHRIN_LOG ZEPHRIN_LOG_PRIVATE

fail() {
    printf '\nFAILED: %s\n' "$1" >&2
    if [ -s "$log" ]; then
        echo "--- the daemon's log:" >&2
        cat "$log" >&2
    fi
    exit 1
}

title() {
    printf '\n== %s\n' "$1"
}

# run STATUS COMMAND...: prints the command, runs it, shows its output, and checks its exit status.
run() {
    expected=$1
    shift
    printf '$'
    for word in "$@"; do
        case $word in
        *[!A-Za-z0-9_./:=,%+@-]*) printf " '%s'" "$word" ;;
        *) printf ' %s' "$word" ;;
        esac
    done
    echo
    status=0
    "$@" >"$output" 2>&1 || status=$?
    sed 's/^/  /' "$output"
    [ "$status" -eq "$expected" ] || fail "exit status $status, expected $expected: $*"
}

# shows TEXT...: the last output has each of the texts.
shows() {
    for text in "$@"; do
        grep -qF -- "$text" "$output" || fail "the output above lacks: $text"
    done
}

# hides TEXT: the last output does not have the text.
hides() {
    ! grep -qF -- "$1" "$output" || fail "the output above should not have: $1"
}

# eventually COMMAND...: tries until the command succeeds; false when it takes too long.
eventually() {
    tries=0
    until "$@"; do
        tries=$((tries + 1))
        [ $tries -lt $step_limit ] || return 1
        sleep 0.1
    done
}

# The socket is there a moment before anybody listens on it.
answers_or_ended() {
    zpctl tree >/dev/null 2>&1 || ! kill -0 "$daemon" 2>/dev/null
}

start_daemon() {
    echo "\$ zpd -d \$ZEPHRIN_HOME/Annotations &"
    zpd -d "$ZEPHRIN_HOME/Annotations" >>"$log" 2>&1 &
    daemon=$!
    eventually answers_or_ended || fail "the daemon does not answer"
    kill -0 "$daemon" 2>/dev/null || fail "the daemon ended at once"
}

stop_daemon() {
    echo "\$ kill %1"
    kill "$daemon"
    status=0
    wait "$daemon" || status=$?
    daemon=
    [ $status -eq 0 ] || fail "the daemon ended with status $status, expected 0"
}

# start_monitor COUNT: tells of so many notifications, from when it has begun.
start_monitor() {
    echo "\$ zpctl monitor --count $1 &"
    : >"$home/monitor"
    zpctl monitor --count "$1" >"$home/heard" 2>"$home/monitor" &
    monitor=$!
    eventually grep -qF waiting "$home/monitor" || fail "the monitor did not begin"
}

stop_monitor() {
    eventually ended "$monitor" || fail "no notification came"
    status=0
    wait "$monitor" || status=$?
    monitor=
    [ $status -eq 0 ] || fail "the monitor ended with status $status, expected 0"
    sed 's/^/  /' "$home/heard"
    grep -qF com.tovana.zephrin.annotation-change "$home/heard" || fail "it heard something else"
}

# start_talk UUID TEXT ANSWER: runs a plug-in until the talk is stopped; it has answered by then.
start_talk() {
    mkfifo "$home/words"
    echo "\$ zpctl run $1 <words >answers &"
    zpctl run "$1" <"$home/words" >"$home/answers" 2>"$home/talk" &
    talk=$!
    exec 3>"$home/words"
    echo "\$ echo $2 >words"
    echo "$2" >&3
    eventually grep -qF "$3" "$home/answers" || {
        cat "$home/talk"
        fail "no answer from the plug-in"
    }
    sed 's/^/  /' "$home/answers"
}

# The plug-in was ended, so its talk is at an end.
stop_talk() {
    eventually ended "$talk" || fail "the talk goes on"
    status=0
    wait "$talk" || status=$?
    talk=
    exec 3>&-
    [ $status -eq 0 ] || fail "the talk ended with status $status, expected 0"
}

# start_hold PATH: a hold until it is stopped; its token is in $token.
start_hold() {
    echo "\$ zpctl hold $1 &"
    : >"$home/hold"
    zpctl hold "$1" >"$home/hold" 2>&1 &
    hold=$!
    eventually grep -qF token "$home/hold" || fail "no hold"
    cp "$home/hold" "$output"
    sed 's/^/  /' "$output"
    token=$(uuid_in_output)
}

stop_hold() {
    echo "\$ kill %2"
    kill "$hold"
    status=0
    wait "$hold" || status=$?
    hold=
    [ $status -eq 0 ] || fail "the hold ended with status $status, expected 0"
}

ended() {
    ! kill -0 "$1" 2>/dev/null || grep -q '^State:[[:space:]]*Z' "/proc/$1/status" 2>/dev/null
}

install_samples() {
    mkdir -p "$ZEPHRIN_HOME/etc"
    cp -R "$build/examples/Applications" "$build/examples/System" "$ZEPHRIN_HOME/"
    # The daemon trusts no bundle that others could change.
    chmod -R u+rwX,go=rX "$ZEPHRIN_HOME"
    echo 'LANG=en_GB.UTF-8' >"$ZEPHRIN_HOME/etc/locale.conf"
}

write_entitlements() {
    cat >"$1" <<'END'
<plist version="1.0">
<dict>
    <key>com.tovana.private.zephrin.manager</key>
    <true/>
</dict>
</plist>
END
}

uuid_in_output() {
    sed -n 's/.*\([0-9A-F]\{8\}\(-[0-9A-F]\{4\}\)\{3\}-[0-9A-F]\{12\}\).*/\1/p' "$output" | head -n 1
}

# tells TEXT COMMAND...: the command's output has the text, now.
tells() {
    text=$1
    shift
    "$@" 2>/dev/null | grep -qF -- "$text"
}

# hides_now TEXT COMMAND...: the command works, and its output does not have the text, now.
hides_now() {
    text=$1
    shift
    "$@" >"$output" 2>/dev/null && ! grep -qF -- "$text" "$output"
}

for program in "$build/bin/zpd" "$build/bin/zpctl" "$build/examples/Applications"; do
    [ -e "$program" ] || fail "not built: $program (make demo builds it)"
done

title "A home with two sample applications, and a daemon on it"
install_samples
echo "\$ export ZEPHRIN_HOME=$ZEPHRIN_HOME"
run 0 ls "$ZEPHRIN_HOME/Applications"
shows Cinema.app Jukebox.app
start_daemon

title "What is installed: applications, and the plug-ins in them"
run 0 zpctl tree
shows Cinema Jukebox 'Poster Painter' 'Subtitle Shifter' 'Word Prediction' Dusk \
    '5 plug-ins in 2 applications'

title "A host looks for plug-ins at an extension point: of one identifier the newest version"
run 0 zpctl match HXExtensionPointIdentifier=com.example.artwork
shows com.example.posters 1.10 '1 plug-in'
hides 1.9

title "Versions compare as numbers: 1.9 comes before 1.10 (flag 1: older versions too)"
run 0 zpctl match --flags 1 HXExtensionIdentifier=com.example.posters 'HXExtensionVersion=<1.10'
shows 1.9 '1 plug-in'
hides 1.10
run 0 zpctl match --flags 1 HXExtensionIdentifier=com.example.posters 'HXExtensionVersion=>=1.9'
shows 1.9 1.10 '2 plug-ins'

title "Alternatives: a keyboard or a theme"
run 0 zpctl match HXExtensionPointIdentifier=com.tovana.keyboard-service \
    HXExtensionPointIdentifier=com.example.themes
shows com.example.predict com.example.theme.dusk '2 plug-ins'

title "One plug-in, by its UUID and by its path"
run 0 zpctl match HXExtensionIdentifier=com.example.predict
uuid=$(uuid_in_output)
[ -n "$uuid" ] || fail "no UUID in the output above"
run 0 zpctl find "$uuid"
shows com.example.predict 'Word Prediction' Predict.appex "$uuid"
run 0 zpctl find "$ZEPHRIN_HOME/Applications/Jukebox.app/PlugIns/Predict.appex"
shows com.example.predict "$uuid"

title "The same for programs"
run 0 zpctl --json find "$uuid"
shows '"identifier": "com.example.predict"' "\"uuid\": \"$uuid\"" '"systemResident": false'

title "What is not there is refused, with the daemon's words and exit status 1"
run 1 zpctl find "$ZEPHRIN_HOME/Applications/Nothing.app/PlugIns/Nothing.appex"
shows 'Cannot locate PlugIn' 'code 15'

title "Host programs ask through libZephrin; an application's own plug-in goes before a newer one"
run 0 "$ZEPHRIN_HOME/Applications/Jukebox.app/Jukebox" com.example.artwork
shows 'com.example.posters 1.10' Jukebox.app/PlugIns
run 0 "$ZEPHRIN_HOME/Applications/Cinema.app/Cinema" com.example.artwork
shows 'com.example.posters 1.9' Cinema.app/PlugIns
hides 1.10

title "The box's language changes: so do the names"
echo "\$ echo LANG=de_DE.UTF-8 > \$ZEPHRIN_HOME/etc/locale.conf"
echo 'LANG=de_DE.UTF-8' >"$ZEPHRIN_HOME/etc/locale.conf"
eventually tells 'Untertitel-Versatz' zpctl tree || true
run 0 zpctl tree
shows Kino Untertitel-Versatz

title "Some questions need an entitlement, which being root does not replace"
run 1 zpctl match --flags 0x200
shows 'code 11'

title "Entitlements are signed: a key, which this box is made to trust, signs a copy of the tool"
run 0 zpctl keygen "$home/keys"
run 0 install -D -m 644 "$home/keys/zephrin.pub.pem" "$ZEPHRIN_HOME/etc/trust.d/demo.pem"
write_entitlements "$home/manager.plist"
run 0 cat "$home/manager.plist"
# Not executable by everybody: who may run it could steer it.
run 0 install -D -m 750 "$build/bin/zpctl" "$ZEPHRIN_HOME/bin/zpctl-manager"
run 0 install -D -m 644 "$build"/lib/libZephrin.so.0 "$ZEPHRIN_HOME/lib/libZephrin.so.0"
run 0 zpctl sign --key "$home/keys/zephrin.key.pem" --entitlements "$home/manager.plist" \
    "$ZEPHRIN_HOME/bin/zpctl-manager"
run 0 "$ZEPHRIN_HOME/bin/zpctl-manager" match --flags 0x200
shows com.example.predict '4 plug-ins'

title "Why the one may, and the other may not"
run 0 zpctl verify "$ZEPHRIN_HOME/bin/zpctl-manager"
shows com.tovana.private.zephrin.manager 'The signature counts.'
run 1 zpctl verify "$build/bin/zpctl"
shows 'Does not count'

title "A plug-in is taken away by its path, and comes back; only a manager may take away"
dusk=$ZEPHRIN_HOME/Applications/Jukebox.app/PlugIns/Dusk.appex
run 1 zpctl remove "$dusk"
shows 'code 11'
run 0 "$ZEPHRIN_HOME/bin/zpctl-manager" remove "$dusk"
run 0 zpctl match HXExtensionPointIdentifier=com.example.themes
shows '0 plug-ins'
run 0 zpctl add "$dusk"
run 0 zpctl match HXExtensionPointIdentifier=com.example.themes
shows com.example.theme.dusk '1 plug-in'

title "Without the key on the box the same program is one like any other"
run 0 rm "$ZEPHRIN_HOME/etc/trust.d/demo.pem"
run 1 "$ZEPHRIN_HOME/bin/zpctl-manager" match --flags 0x200
shows 'code 11'

title "The user elects a plug-in; whoever listens hears of it"
run 0 zpctl match HXExtensionIdentifier=com.example.subtitle-shifter
subtitles=$(uuid_in_output)
[ -n "$subtitles" ] || fail "no UUID in the output above"
run 0 zpctl match HXUserElection=1
shows '0 plug-ins'
start_monitor 1
run 0 zpctl elect "$subtitles" on
shows 'is elected'
stop_monitor

title "Discovery by election follows, at once"
run 0 zpctl match HXUserElection=1
shows com.example.subtitle-shifter 2.3 elected '1 plug-in'
run 0 zpctl tree
shows ' elected '
run 0 zpctl elect "$subtitles" off
run 0 zpctl match HXUserElection=1
shows '0 plug-ins'
run 0 zpctl tree
shows ' not elected '
run 0 zpctl elect "$subtitles" on

title "A plug-in is made ready, launched in its sandbox, and talked to over its socket"
predict=$ZEPHRIN_HOME/Applications/Jukebox.app/PlugIns/Predict.appex
run 0 zpctl ready "$uuid"
run 0 sh -c "echo co | zpctl run $uuid"
shows 'comedy concert cooking'

title "A host does the same through libZephrin, and reads a file of the bundle by a token"
run 0 "$ZEPHRIN_HOME/Applications/Jukebox.app/Jukebox" com.tovana.keyboard-service co
shows com.example.predict 'comedy concert cooking' 'by token'
run 0 zpctl access "$uuid"
shows "$uuid" 'zsx1;com.tovana.app-sandbox.read;1;file;' Predict.appex

title "While it runs, everybody can see it, and what it is confined by"
start_talk "$uuid" co 'comedy concert cooking'
run 0 zpctl ps
shows com.example.predict keyboard '1 plug-in running'
run 0 zpctl --json ps
shows '"wanted"' '"enforced"'

title "A maintainer's hold: refused while the plug-in is busy, or it ends the plug-in first"
run 1 zpctl hold --refuse-busy "$predict" -- echo held
shows 'plug-ins are busy' 'code 14' com.example.predict
hides held
run 7 zpctl hold --terminate "$predict" -- sh -c \
    "zpctl ps; zpctl match HXExtensionIdentifier=com.example.predict; zpctl ready $uuid; exit 7"
shows '0 plug-ins running' '0 plug-ins' 'access to plugin com.example.predict denied: the plug-in is on hold'
stop_talk

title "A hold for longer, and its release by its token"
start_hold "$predict"
run 1 zpctl ready "$uuid"
shows 'on hold' 'code 11'
run 0 zpctl release "$token"
run 0 zpctl ready "$uuid"
stop_hold

title "An application goes while the daemon runs"
run 0 zpctl uninstall com.example.cinema
eventually hides_now com.example.subtitles zpctl tree || true
run 0 zpctl tree
hides com.example.subtitles
shows '3 plug-ins in 1 application'

title "And is installed again: its plug-ins are new ones, but what the user chose stays"
run 0 zpctl install "$build/examples/Applications/Cinema.app"
eventually tells com.example.subtitles zpctl tree || true
run 0 zpctl match HXUserElection=1
shows com.example.subtitle-shifter 2.3 elected '1 plug-in'
hides "$subtitles"

title "A new version over it, in one step, while none of its plug-ins runs or can be started"
cp -R "$build/examples/Applications/Cinema.app" "$home/Cinema.app"
sed -i 's/>4\.2</>4.3</' "$home/Cinema.app/Info.plist"
sed -i 's/>2\.3</>2.4</' "$home/Cinema.app/PlugIns/Subtitles.appex/Info.plist"
run 0 zpctl hold --app --terminate "$ZEPHRIN_HOME/Applications/Cinema.app" -- \
    zpctl install "$home/Cinema.app"
shows 'com.example.cinema 4.3' 'in place of com.example.cinema 4.2'
eventually tells 2.4 zpctl match HXExtensionIdentifier=com.example.subtitle-shifter || true
run 0 zpctl match --flags 1 HXExtensionIdentifier=com.example.subtitle-shifter
shows 2.4 elected '1 plug-in'

title "After a restart everything is still known, under the same UUID, and so is the user's choice"
stop_daemon
run 3 zpctl find "$uuid"
start_daemon
run 0 zpctl find "$uuid"
shows com.example.predict "$uuid"
run 0 zpctl match HXUserElection=1
shows com.example.subtitle-shifter 2.4 elected '1 plug-in'
stop_daemon

printf '\nThe demo worked: every step above did what it should.\n'
