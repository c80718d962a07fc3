#!/usr/bin/env bash
# End-to-end tests of hadrosim and of the host session around hadrocli commands, run as
# processes on temporary state files.
#   e2e.sh HADROSIM HADROCLI TEST_PLUGIN_DIR
set -u
SIM=$1
CLI=$2
PLUGINS=$3
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
unset HADRO_STATE

passed=0
failed=0
# t NAME COMMAND...: one check; passes when the command succeeds.
t() {
    local name=$1
    shift
    if "$@"; then
        passed=$((passed + 1))
    else
        failed=$((failed + 1))
        echo "FAIL: $name"
    fi
}
same_file() { cmp -s "$1" "$2"; }
fingerprint() { stat -c '%i %y %s' "$1"; }
cli() { "$CLI" --plugin-dir="$PLUGINS" "$@"; }
# exits_with STATUS COMMAND...: the command ends with that status.
exits_with() {
    local want=$1
    shift
    "$@" >"$work/out" 2>"$work/err"
    local got=$?
    [ "$got" = "$want" ] || { echo "  '$*' exited $got, not $want: $(head -c 300 "$work/err")"; return 1; }
}
# full_exits_with STATUS COMMAND...: the same with standard output on a full disk.
full_exits_with() {
    local want=$1
    shift
    "$@" >/dev/full 2>"$work/err"
    local got=$?
    [ "$got" = "$want" ] || { echo "  '$*' >/dev/full exited $got, not $want: $(head -c 300 "$work/err")"; return 1; }
}
one_line_naming() { [ "$(wc -l <"$work/err")" = 1 ] && grep -qF -- "$1" "$work/err"; }

# ---- reset, export, import ----
S=$work/new/dir/host.json
t "reset creates the state file and its directories" "$SIM" --state="$S" reset
t "new state file is mode 0600" [ "$(stat -c %a "$S")" = 600 ]
t "created directory is mode 0700" [ "$(stat -c %a "$work/new/dir")" = 700 ]
"$SIM" --state="$S" export >"$work/export.json"
t "export prints the state document" same_file "$work/export.json" "$S"
t "export begins with the version" grep -q '^{"version":1,$' "$work/export.json"
"$SIM" --state="$S" journal on
t "import replaces the document" "$SIM" --state="$S" import "$work/export.json"
t "import round trip keeps every byte" same_file "$work/export.json" "$S"
"$SIM" --state="$S" journal on
t "import from standard input" "$SIM" --state="$S" import - <"$work/export.json"
t "import from standard input round trip" same_file "$work/export.json" "$S"
t "HADRO_STATE selects the state file" env HADRO_STATE="$S" "$SIM" fault list
env XDG_STATE_HOME="$work/xdg" "$SIM" reset
t "XDG_STATE_HOME/hadro/host.json is the default" [ -f "$work/xdg/hadro/host.json" ]
env -u XDG_STATE_HOME HOME="$work/home" "$SIM" reset
t "HOME/.local/state/hadro/host.json without XDG_STATE_HOME" [ -f "$work/home/.local/state/hadro/host.json" ]

# ---- faults ----
"$SIM" --state="$S" fault add A::B
"$SIM" --state="$S" fault add A::C --target vmnic1 --message "boom now" --count 2
printf 'A::B\t*\tunlimited\tSimulated failure in A::B\nA::C\tvmnic1\t2\tboom now\n' >"$work/want"
"$SIM" --state="$S" fault list >"$work/got"
t "fault list shows operation, target, count and message" same_file "$work/want" "$work/got"
"$SIM" --state="$S" fault clear
t "fault clear empties the table" [ -z "$("$SIM" --state="$S" fault list)" ]

"$SIM" --state="$S" fault add SimTest::Touch --target vmnic0 --message "injected" --count 2
t "a fault fails a matching call" exits_with 1 cli --state="$S" simtest touch --mode ok
t "the fault's message is the command's error" grep -qx injected "$work/err"
t "a counted fault fails again" exits_with 1 cli --state="$S" simtest touch --mode ok
t "a used-up fault is gone" exits_with 0 cli --state="$S" simtest touch --mode ok
t "a used-up fault is no longer listed" [ -z "$("$SIM" --state="$S" fault list)" ]
"$SIM" --state="$S" fault add SimTest::Touch --target vmnic9
t "a fault on another target does not fire" exits_with 0 cli --state="$S" simtest touch --mode ok
"$SIM" --state="$S" fault add SimTest::Touch
t "a fault without target fires on any target" exits_with 1 cli --state="$S" simtest touch --mode ok
t "the default fault message names the operation" grep -qx "Simulated failure in SimTest::Touch" "$work/err"
"$SIM" --state="$S" fault clear

# ---- journal ----
"$SIM" --state="$S" journal clear
"$SIM" --state="$S" journal on
cli --state="$S" simtest touch --mode ok >/dev/null
cli --state="$S" simtest touch --mode read >/dev/null
printf 'SimTest::Touch vmnic0 ok\nSimTest::Touch vmnic0 read\n' >"$work/want"
"$SIM" --state="$S" journal show >"$work/got"
t "journal records calls in order" same_file "$work/want" "$work/got"
"$SIM" --state="$S" journal clear
t "journal clear forgets the calls" [ -z "$("$SIM" --state="$S" journal show)" ]
"$SIM" --state="$S" journal off
cli --state="$S" simtest touch --mode read >/dev/null
t "journal off records nothing" [ -z "$("$SIM" --state="$S" journal show)" ]

# ---- refused command lines leave the state alone ----
N=$work/untouched/host.json
for args in "" "bogus" "fault" "fault add" "fault add X --count 0" "fault add X --count abc" \
    "fault add X Y" "fault add X --colour red" "journal maybe" "journal show extra" "import" "reset now" \
    "--frob reset"; do
    # shellcheck disable=SC2086
    t "hadrosim $args is refused with status 2" exits_with 2 "$SIM" --state="$N" $args
done
t "hadrosim --help prints the usage" exits_with 0 "$SIM" --help
t "hadrosim --help names the commands" grep -q "fault add OPERATION" "$work/out"
for args in "--help" "--list-commands" "simtest" "simtest touch" "nosuch command"; do
    # shellcheck disable=SC2086
    cli --state="$N" $args >/dev/null 2>&1
done
t "help, listings and refusals never create the state" [ ! -e "$N" ] && [ ! -e "$N.lock" ]

# ---- hadrocli: one command, one transaction ----
C=$work/cli/host.json
t "a first command creates the state from the default host" exits_with 0 cli --state="$C" simtest touch --mode read
t "... which is written on that first use" grep -q '"ipsettings":{"ipv6Enabled":true}' "$C"
t "a command that succeeds is committed" exits_with 0 cli --state="$C" simtest touch --mode ok
t "... with its change" grep -q '"ipsettings":{"ipv6Enabled":false}' "$C"
t "a command that reports an error is committed" exits_with 1 cli --state="$C" simtest touch --mode error
t "... with its change" grep -q '"ipsettings":{"ipv6Enabled":true}' "$C"
cp "$C" "$work/before"
t "an exception escaping the command gives status 3" exits_with 3 cli --state="$C" simtest touch --mode throw
t "... and discards the changes" same_file "$work/before" "$C"

# ---- an unchanged state is not rewritten ----
before=$(fingerprint "$C")
cli --state="$C" simtest touch --mode read >/dev/null
"$SIM" --state="$C" fault list >/dev/null
"$SIM" --state="$C" journal show >/dev/null
"$SIM" --state="$C" journal off
"$SIM" --state="$C" fault clear
"$SIM" --state="$C" export >/dev/null
t "reading commands leave inode and mtime alone" [ "$before" = "$(fingerprint "$C")" ]

# ---- damaged state files are refused and left as they are ----
canonical=$work/canonical.json
"$SIM" --state="$canonical" reset
D=$work/damaged/host.json
mkdir -p "$work/damaged"
damage() {
    case $1 in
    empty) : >"$D" ;;
    blank) printf '  \n' >"$D" ;;
    truncated) head -c 20000 "$canonical" >"$D" ;;
    truncated-end) head -c -3 "$canonical" >"$D" ;;
    garbage) printf 'hello, world\n' >"$D" ;;
    binary) head -c 512 /dev/urandom >"$D" ;;
    version) sed 's/^{"version":1,$/{"version":2,/' "$canonical" >"$D" ;;
    no-version) sed 's/^{"version":1,$/{/' "$canonical" >"$D" ;;
    unknown-section) sed 's/^"journal":/"jounral":/' "$canonical" >"$D" ;;
    bad-json) sed 's/^"pnics":\[/"pnics":[1,,/' "$canonical" >"$D" ;;
    wrong-type) sed 's/"name":"vmnic0"/"name":7/' "$canonical" >"$D" ;;
    inconsistent) sed 's/"name":"vmnic1"/"name":"vmnic0"/' "$canonical" >"$D" ;;
    dangling) sed 's/"ownerWorldId":2110598/"ownerWorldId":42/' "$canonical" >"$D" ;;
    # Damage in a section the commands below never touch.
    switch-bad-json) sed 's/^"vswitches":\[/"vswitches":[1,,/' "$canonical" >"$D" ;;
    switch-twice) sed 's/"name":"vSwitch1"/"name":"vSwitch0"/' "$canonical" >"$D" ;;
    port-dangling) sed 's/"worldId":2110231/"worldId":42/' "$canonical" >"$D" ;;
    esac
}
for kind in empty blank truncated truncated-end garbage binary version no-version unknown-section bad-json \
    wrong-type inconsistent dangling switch-bad-json switch-twice port-dangling; do
    damage $kind
    cp "$D" "$work/damaged.copy"
    t "hadrosim refuses a $kind state file with status 3" exits_with 3 "$SIM" --state="$D" fault add X
    t "... in one line naming the file ($kind)" one_line_naming "$D"
    t "hadrocli refuses a $kind state file with status 3" exits_with 3 cli --state="$D" simtest touch --mode read
    t "... in one line naming the file ($kind)" one_line_naming "$D"
    t "hadrocli refuses to change a $kind state file" exits_with 3 cli --state="$D" simtest touch --mode ok
    t "... in one line naming the file ($kind)" one_line_naming "$D"
    t "... and leaves it byte for byte ($kind)" same_file "$D" "$work/damaged.copy"
    t "hadrosim refuses to import a $kind document" exits_with 3 "$SIM" --state="$C" import "$work/damaged.copy"
done
t "a refused import leaves the state alone" same_file "$work/before" "$C"
damage switch-twice
exits_with 3 cli --state="$D" simtest touch --mode ok
t "the fault is named" grep -qF "vswitches: duplicate switch name 'vSwitch0'" "$work/err"

# ---- hand edits that keep the document valid are taken ----
H=$work/hand/host.json
"$SIM" --state="$H" reset
sed -i 's/"mtu":1500,"cdpStatus"/"mtu":9000,"cdpStatus"/' "$H"
t "a valid hand edit is taken" exits_with 0 cli --state="$H" simtest touch --mode ok
t "... and kept by the change" grep -q '"mtu":9000,"cdpStatus"' "$H"
sed -i -e '/^"digests":/d' -e 's/^\("journal":.*\),$/\1/' "$H"
t "a document without digests is taken" exits_with 0 cli --state="$H" simtest touch --mode ok
t "... and written back with them" grep -q '^"digests":{"pnics":"[0-9a-f]\{16\}",' "$H"
"$SIM" --state="$H" export | sed 's/"mtu":9000,"cdpStatus"/"mtu":1600,"cdpStatus"/' >"$work/edited.json"
t "an exported document edited by hand imports" exits_with 0 "$SIM" --state="$H" import "$work/edited.json"
"$SIM" --state="$H" export >"$work/export.json"
t "... and exports as the state file it became" same_file "$work/export.json" "$H"
t "... with the edit" grep -q '"mtu":1600,"cdpStatus"' "$H"
mkdir -p "$work/dir-state"
t "a directory is no state file" exits_with 3 cli --state="$work/dir-state" simtest touch --mode read
: >"$work/not-a-dir"
t "a state file below a regular file is refused" exits_with 3 cli --state="$work/not-a-dir/host.json" simtest touch --mode read
damage garbage
t "reset repairs a damaged state file" "$SIM" --state="$D" reset
t "... to the default host" same_file "$D" "$canonical"

# ---- state paths that are not regular files ----
P=$work/paths
mkdir -p "$P/real" "$P/links"
mkfifo "$P/fifo.json"
# A FIFO would block a reader that opened it; timeout makes that a failure here.
t "hadrocli refuses a FIFO at once" exits_with 3 timeout 20 "$CLI" --plugin-dir="$PLUGINS" --state="$P/fifo.json" \
    simtest touch --mode read
t "... in one line saying why" one_line_naming "$P/fifo.json: not a regular file (it is a FIFO)"
t "hadrosim refuses a FIFO at once" exits_with 3 timeout 20 "$SIM" --state="$P/fifo.json" fault list
t "... and so does hadrosim reset" exits_with 3 timeout 20 "$SIM" --state="$P/fifo.json" reset
t "... which leaves it as it is, creating nothing beside it" [ -p "$P/fifo.json" ] && [ ! -e "$P/fifo.json.lock" ]
"$SIM" --state="$P/real/host.json" reset
ln -s ../real/host.json "$P/links/one.json"
ln -s one.json "$P/links/two.json"
ln -s "$P/links/two.json" "$P/abs.json"
t "a change through a chain of symbolic links" exits_with 0 cli --state="$P/abs.json" simtest touch --mode ok
t "... changes the file at its end" grep -q '"ipsettings":{"ipv6Enabled":false}' "$P/real/host.json"
t "... and keeps every link" [ -L "$P/abs.json" ] && [ -L "$P/links/one.json" ] && [ -L "$P/links/two.json" ]
t "... locking the file at its end" [ -f "$P/real/host.json.lock" ] && [ ! -e "$P/abs.json.lock" ]
t "hadrosim reset through a link" "$SIM" --state="$P/links/two.json" reset
t "... keeps the link and resets its target" [ -L "$P/links/two.json" ] && same_file "$P/real/host.json" "$canonical"
ln -s nowhere.json "$P/dangling.json"
t "hadrocli refuses a dangling link" exits_with 3 cli --state="$P/dangling.json" simtest touch --mode read
t "... in one line naming its target" one_line_naming "$P/dangling.json: a symbolic link to $P/nowhere.json, which does not exist"
t "hadrosim reset refuses it too" exits_with 3 "$SIM" --state="$P/dangling.json" reset
t "... creating nothing" [ ! -e "$P/nowhere.json" ] && [ ! -e "$P/nowhere.json.lock" ] && [ -L "$P/dangling.json" ]
ln -s loop.json "$P/loop.json"
t "a loop of links is refused" exits_with 3 cli --state="$P/loop.json" simtest touch --mode read
t "... in one line" one_line_naming "too many levels of symbolic links"

# ---- output that cannot be written is a failure; what was committed stays ----
if [ -c /dev/full ]; then
    W=$work/write/host.json
    "$SIM" --state="$W" reset
    full="No space left on device"  # the programs do not set a locale: messages are in English
    t "hadrocli fails when its output cannot be written" full_exits_with 3 cli --formatter=json --state="$W" simtest touch --mode ok
    t "... in one line" one_line_naming "Error: write error: $full"
    t "... and its change stays committed" grep -q '"ipsettings":{"ipv6Enabled":false}' "$W"
    t "... so do help and listings" full_exits_with 3 cli --help
    t "... and a batch" full_exits_with 3 sh -c "printf 'simtest touch --mode ok\nsimtest touch --mode ok\n' |
        '$CLI' --plugin-dir='$PLUGINS' --state='$W' --formatter=json --batch -"
    t "... which stops at the first output lost, after committing that line" \
        grep -q '"ipsettings":{"ipv6Enabled":true}' "$W"
    t "... and an atomic batch, after committing" full_exits_with 3 sh -c "echo 'simtest touch --mode ok' |
        '$CLI' --plugin-dir='$PLUGINS' --state='$W' --formatter=json --batch - --atomic"
    t "... the whole batch" grep -q '"ipsettings":{"ipv6Enabled":false}' "$W"
    t "hadrosim export fails when its output cannot be written" full_exits_with 3 "$SIM" --state="$W" export
    t "... in one line" one_line_naming "hadrosim: write error: $full"
    t "... so does its help" full_exits_with 3 "$SIM" --help
fi
W=$work/closed/host.json
t "hadrocli with standard output closed fails" exits_with 3 sh -c "'$CLI' --plugin-dir='$PLUGINS' --state='$W' \
    --formatter=json simtest touch --mode read >&-"
t "... in one line" one_line_naming "Error: write error: Bad file descriptor"
t "... and writes nothing into the lock file" [ ! -s "$W.lock" ]

# ---- several writers at once lose nothing (the lock) ----
L=$work/lock/host.json
"$SIM" --state="$L" reset
for writer in 1 2 3 4 5 6 7 8; do
    (for n in $(seq 1 25); do "$SIM" --state="$L" fault add "W$writer::Op$n" || exit 1; done) &
done
wait
t "8 writers x 25 faults: all 200 are there" [ "$("$SIM" --state="$L" fault list | wc -l)" = 200 ]
t "... each exactly once" [ "$("$SIM" --state="$L" fault list | cut -f1 | sort -u | wc -l)" = 200 ]

# ---- a writer killed at any point leaves an old or a new document, never a torn one ----
K=$work/kill/host.json
"$SIM" --state="$K" reset
small=$work/small.json
cp "$K" "$small"
big=$work/big.json
entry='{"protocol":"tcp","recvQ":0,"sendQ":0,"localAddress":"192.0.2.10","localPort":22,"foreignAddress":"198.51.100.9","foreignPort":40000,"state":4,"worldId":2097905,"ccAlgo":"newreno"},'
prefix='"connections":[{"netstack":"defaultTcpipStack","connections":['
while IFS= read -r line; do
    if [[ $line == "$prefix"* ]]; then
        printf '%s' "$prefix"
        yes "$entry" | head -n 6000 | tr -d '\n'
        printf '%s\n' "${line#"$prefix"}"
    else
        printf '%s\n' "$line"
    fi
done <"$small" >"$big"
"$SIM" --state="$work/big-canonical.json" import "$big"
torn=0
for round in $(seq 1 20); do
    if [ $((round % 2)) = 0 ]; then source=$big; else source=$small; fi
    "$SIM" --state="$K" import "$source" 2>/dev/null &
    victim=$!
    sleep "0.$(printf '%03d' $((RANDOM % 120)))"
    kill -9 "$victim" 2>/dev/null
    wait "$victim" 2>/dev/null
    if ! same_file "$K" "$small" && ! same_file "$K" "$work/big-canonical.json"; then torn=$((torn + 1)); fi
done
t "no killed writer left a torn or empty state file" [ "$torn" = 0 ]
t "the state file is sound after the killings" "$SIM" --state="$K" fault add After::Kill
t "temporary files of killed writers are cleaned up" [ -z "$(find "$work/kill" -name '.host.json.tmp.*')" ]

echo "$passed passed, $failed failed"
[ "$failed" = 0 ]
