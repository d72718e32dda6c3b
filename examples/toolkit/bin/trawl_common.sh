# What the toolkit's programs share. It is sourced by a program that has set `program` to its own
# name and `home` to the toolkit's home directory; it is not a program itself.
#
# The state of the toolkit is "config/trawlcfg.state", lines of key=value that differ from the
# start-up state:
#   scanners=disabled        the scanners refuse to run
#   common_trace_path=DIR    where the scanners write their traces
# A state of nothing but start-up values has no file, so switching something on and off again leaves
# the configuration as it was, byte for byte.
#
# Every command line that trawlcfg and trawlfs receive is appended to a command log, one line each:
# the program's name and its arguments, those with a blank in them in double quotes. Two variables
# of the environment are for tests:
#   ZOR_COMMAND_LOG=FILE     the command log is FILE, which outlives a removal of the toolkit.
#                            Without it the log is "config/trawlcfg.log"; only commands that
#                            succeeded go there, so that a failed one leaves nothing behind.
#   ZOR_FAIL=COMMAND:STATUS  a command line that starts with the words COMMAND (with or without the
#                            program's name in front) does nothing and ends with STATUS. Several are
#                            separated by ";". For example:
#                              ZOR_FAIL="-disable all:3"
#                              ZOR_FAIL="trawlfs -shutdown:1;-shutdown all -timeout 120:5"
#                              ZOR_FAIL="-s common_trace_path:9"
# shellcheck shell=sh
# shellcheck disable=SC2154 # program and home: see above
# shellcheck disable=SC2034 # scanners: for those who source this

umask 022

state_file=$home/config/trawlcfg.state
scratch_file=$home/config/Zor.tmp
own_command_log=$home/config/trawlcfg.log
scanners="trawlfs trawlhw trawlsw trawlvpd"

die()
{
    status=$1
    shift
    printf '%s: %s\n' "$program" "$*" >&2
    exit "$status"
}

# The value of key $1 in the property file $2; nothing when there is no such key.
property()
{
    sed -n "s/^[[:blank:]]*$1[[:blank:]]*=[[:blank:]]*//p" "$2" 2>/dev/null | head -n 1
}

state()
{
    property "$1" "$state_file"
}

# Makes $1 (enabled or disabled) and the common trace path $2 the state.
write_state()
{
    {
        [ "$1" = enabled ] || printf 'scanners=%s\n' "$1"
        [ -z "$2" ] || printf 'common_trace_path=%s\n' "$2"
    } >"$scratch_file" || die 1 "cannot write $scratch_file"

    if [ -s "$scratch_file" ]; then
        mv -f "$scratch_file" "$state_file"
    else
        rm -f "$scratch_file" "$state_file"
    fi
}

command_line_of()
{
    printf '%s' "$program"
    for word in "$@"; do
        case $word in
            *' '*) printf ' "%s"' "$word" ;;
            *) printf ' %s' "$word" ;;
        esac
    done
}

# The status that ZOR_FAIL wants for $command_line, or nothing.
wanted_failure()
{
    printf '%s\n' "${ZOR_FAIL-}" | tr ';' '\n' | while IFS= read -r item; do
        case "$command_line " in
            "${item%:*} "* | "$program ${item%:*} "*)
                printf '%s\n' "${item##*:}"
                break
                ;;
        esac
    done
}

# Takes note of the command line before it is obeyed.
receive()
{
    command_line=$(command_line_of "$@")
    if [ -n "${ZOR_COMMAND_LOG-}" ]; then
        printf '%s\n' "$command_line" >>"$ZOR_COMMAND_LOG" ||
            die 1 "cannot write $ZOR_COMMAND_LOG"
    fi

    failure=$(wanted_failure)
    [ -z "$failure" ] || die "$failure" "made to fail: $command_line"
}

# Ends a command that succeeded.
succeed()
{
    if [ -z "${ZOR_COMMAND_LOG-}" ] && [ -w "$home/config" ]; then
        printf '%s\n' "$command_line" >>"$own_command_log"
    fi
    exit 0
}

# A running scanner has a file named by its process id in "bin/etc/<scanner>". The process is asked
# for its name too, because a scanner that was killed leaves its file and the number is used again.
processes_of()
{
    for entry in "$home/bin/etc/$1"/[0-9]*; do
        if [ -r "/proc/${entry##*/}/cmdline" ] &&
            tr '\0' '\n' <"/proc/${entry##*/}/cmdline" | grep -Eq "(^|/)$1\$"; then
            printf '%s\n' "${entry##*/}"
        fi
    done
}

send_signal()
{
    for process in $(processes_of "$2"); do
        kill -s "$1" "$process" 2>/dev/null || true # it may have ended by now
    done
}

# Stops the scanner $1: asks it to end, waits up to $2 seconds, then kills it when $3 is "-force".
stop_scanner()
{
    waited=0
    send_signal TERM "$1"
    while [ -n "$(processes_of "$1")" ]; do
        if [ "$waited" -eq "$2" ] && [ "$3" = -force ]; then
            send_signal KILL "$1"
        elif [ "$waited" -ge "$2" ]; then
            die 1 "$1 does not end"
        fi
        sleep 1
        waited=$((waited + 1))
    done
    rm -f "$home/bin/etc/$1"/[0-9]*
}

# Starts a scanner's run: refused while the scanners are disabled, and known to stop_scanner().
begin_scan()
{
    [ "$(state scanners)" != disabled ] || die 4 "the scanners are disabled"

    scanner_dir=$home/bin/etc/$program
    if [ ! -d "$scanner_dir" ]; then
        mkdir -p "$scanner_dir"
        chmod 777 "$scanner_dir" # everybody may scan
    fi
    # Never through a link that somebody else put there.
    (set -C && : >"$scanner_dir/$$") || die 1 "cannot write below $scanner_dir"
    trap 'rm -f "$scanner_dir/$$"' EXIT
    trace started
}

# Writes a line to the trace file, if there is a directory for it.
trace()
{
    trace_dir=$(state common_trace_path)
    [ -n "$trace_dir" ] || trace_dir=$(property trace_file_path "$home/config/Zor.properties")
    if [ -d "$trace_dir" ] && [ -w "$trace_dir" ]; then
        printf '%s[%s] %s\n' "$program" "$$" "$1" \
            >>"$trace_dir/$(property trace_file "$home/config/Zor.properties")"
    fi
}

# The names of the fields that the file $1 of the configuration directory asks for.
fields_of()
{
    sed -n 's/.*<field name="\([a-z_.]*\)".*/\1/p' "$home/config/$1"
}

print_title()
{
    printf '%s\n' "$(property title "$home/properties/$program.properties")"
}

print_field()
{
    printf '  %s = %s\n' "$1" "${2:-unknown}"
}
