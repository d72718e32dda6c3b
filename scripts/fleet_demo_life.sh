#!/bin/sh
# The roll-outs of the demo, which scripts/fleet_demo.sh runs while its eight hosts do.
# Usage: scripts/fleet_demo_life.sh WORK REPORT_DIR     (WORK has the programs and two releases)
set -eu
work=$1 report=$2
hosts=$(dirname "$0")/../fleet/hosts

say() { printf '\n### %s\n' "$*"; }

cat >"$work/rollout.yml" <<'END'
- ansible.builtin.import_playbook: corvan.zor.rollout
END

# Rolls release $1 out, with further arguments, and shows what ansible-playbook did to each host.
roll_out()
{
    release=$1
    shift
    status=0
    ansible-playbook "$work/rollout.yml" -e zor_rollout_exploiter=SHOP \
        -e "zor_rollout_spb=$work/$release.spb" -e "zor_rollout_programs=$work/programs" \
        -e '{"zor_rollout_batches": [1, 3, 4]}' -e "zor_rollout_report=$report" "$@" \
        >"$work/output" 2>&1 || status=$?
    sed -n -e '/^changed: /p' -e 's/^fatal: \(.*\): FAILED! => {"changed": false, "msg": "\(.*\)"}$/failed: \1 \2/p' \
        "$work/output"
    sed -n '/^PLAY RECAP/,$p' "$work/output"
    echo "ansible-playbook ended with $status"
}

say "Release 1 on all hosts: host1 is the canary, then three, then four"
roll_out release1

say "The same again changes nothing"
roll_out release1

say "host3 has a full disk, host4 does not answer any more"
# shellcheck disable=SC2016 # for the shell of the host
"$hosts" in host3 sh -c 'cp -a /opt /srv && size=$(du -sk /opt | cut -f1) &&
    mount -t tmpfs -o mode=0755,size=$((size + 40))k disk /opt && cp -a /srv/opt/. /opt'
"$hosts" in host4 sh -c 'kill -9 -1' 2>/dev/null || :

say "Release 2: the batch of host2, host3 and host4 fails, and the roll-out stops"
roll_out release2

say "These hosts are not done"
cat "$report/unfinished"

say "Both are repaired; the same command for these hosts alone"
"$hosts" in host3 mount -o remount,size=100m /opt
"$hosts" in host4 /usr/sbin/sshd -E /var/log/sshd.log
roll_out release2 --limit "@$report/unfinished"

say "What a host reports of itself, as local facts"
cat >"$work/status.yml" <<'END'
- hosts: host3
  gather_facts: false
  roles:
    - corvan.zor.status
  tasks:
    - ansible.builtin.debug:
        msg: "{{ item.home }}: {{ item.version }}, {{ item.health }}, used by {{ item.exploiters }}"
      loop: "{{ ansible_local.corvan_zor.installations | selectattr('health', 'eq', 'intact') }}"
      loop_control: {label: "{{ item.type }}"}
END
ansible-playbook "$work/status.yml" | sed -n 's/^ *"msg": "\(.*\)"$/host3: \1/p'

say "The report: $report/report.html"
sed -n 's/<strong>\(.*\)<\/strong>/\1/p' "$report/report.html" | sed 's/<[^>]*>//g'
