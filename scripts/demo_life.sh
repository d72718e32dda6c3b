#!/bin/sh
# The life that scripts/demo.sh shows: only for a sandbox, since it installs and removes.
# Usage: scripts/demo_life.sh DIR        (DIR holds wzorinst and toolkit.spb)
set -eu
media=$1
home=/opt/corvan/zor
registry=/etc/zor/zor.ini
export ZOR_COMMAND_LOG=/tmp/commands
PATH=$media:/usr/bin
cd /tmp

say() { printf '\n### %s\n' "$*"; }

# Runs the installer, then shows the state of the machine and the calls of the scanner control.
run()
{
    : >"$ZOR_COMMAND_LOG"
    printf '$ wzorinst %s\n' "$*"
    wzorinst "$@"
    printf '\n--- status report\n'
    wzorinst t
    printf '\n--- command lines of the scanner control\n'
    cat "$ZOR_COMMAND_LOG"
}

show() { printf '\n--- %s\n' "$1"; cat "$1"; }
version_of_registry() { sed -i "s/^ZOR_Version = .*/ZOR_Version = $1/" "$registry"; }
modes() { find "$@" -printf '%M %p\n' | sort -k 2; }

[ -n "${WZOR_SANDBOX-}" ] || { echo "This belongs into the sandbox of scripts/demo.sh" >&2; exit 1; }

say "A first exploiter, SHOP, installs the toolkit for everybody"
run i SHOP -s "$media/toolkit.spb"
printf '\n--- the installed tree\n'
modes "$home" /etc/zor /usr/kel
show "$registry"
show "$home/ZOR_files"

say "A second one, DESK, brings the same build: files are deployed again, DESK is registered"
run i DESK -s "$media/toolkit.spb"

say "The administrator changes a setting, and an older version is registered: an upgrade"
sed -i 's/^fscanner.changepriority=.*/fscanner.changepriority=low/' "$home/config/Zor.properties"
version_of_registry 9.1.7.0003
run i SHOP -s "$media/toolkit.spb"
printf '\n--- the setting after the upgrade\n'
grep changepriority "$home/config/Zor.properties"

say "A newer version is registered: CLUB only joins the list"
version_of_registry 9.3.0.0000
run i CLUB -s "$media/toolkit.spb"

for exploiter in SHOP CLUB; do
    say "$exploiter leaves: the others keep the toolkit"
    run r "$exploiter"
done

say "DESK, the last one, leaves: nothing of the toolkit remains"
run r DESK
printf '\n--- what is left\n'
modes /opt /etc/zor /etc/kel /usr/kel 2>/dev/null || true

say "A private installation, without any registry"
run i SHOP -s "$media/toolkit.spb" -p -d /opt/shop/zor || echo "exit status $?"
modes /opt/shop

say "And its removal"
run r SHOP -p -d /opt/shop/zor || echo "exit status $?"
modes /opt
