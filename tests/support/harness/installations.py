"""What `wzorinst i ABC -s /media/toolkit.spb` prints and leaves on an empty machine.

The names with SHARED are for root's installation, those with ANNS for the one of the user ann.
Pieces of transcripts are those of root's runs on the shared installation, in any test.
"""

PACKAGE = "SPB file: /media/toolkit.spb\n"

SETTINGS = """\
ZOR version: 22/12/02zor_9.2.30.0000
Install type: global
Register exploiter: yes
Default dest: /opt/corvan/zor
INI location: /etc/zor/zor.ini
Looking for INI file: /etc/zor/zor.ini
"""

HOMES = """\
Log file is: /opt/corvan/zor/ZOR_files
currentZorHome = '/opt/corvan/zor' currentCfgHome = '/opt/corvan/zor'
"""

FOUND = SETTINGS + "INI file found, verifying...\nZOR directory verified ok\n" + HOMES

NOT_FOUND = SETTINGS + "INI file not found or outdated (code=1)\n" + HOMES

FRESH_START = (
    PACKAGE
    + NOT_FOUND
    + """\
Loading file /opt/corvan/zor/install/zor_install.properties error: 2 (No such file or directory)
Performing fresh install on /opt/corvan/zor (config=/opt/corvan/zor/config)
Starting file extraction...
"""
)

NO_SELINUX = """\
Exec '/usr/sbin/selinuxenabled >/dev/null 2>&1' returned 32512
SELinux not enabled or not supported
"""

STOPPED = """\
Exec '/opt/corvan/zor/bin/trawlfs -shutdown >/dev/null 2>&1' returned 0
Exec '/opt/corvan/zor/bin/trawlcfg -disable all >/dev/null 2>&1' returned 0
Exec '/opt/corvan/zor/bin/trawlcfg -shutdown all -timeout 60 -force >/dev/null 2>&1' returned 0
Exec '/opt/corvan/zor/bin/trawlcfg -shutdown all -timeout 120 >/dev/null 2>&1' returned 0
"""

UPGRADE_START = (
    PACKAGE
    + FOUND
    + "Installed ZOR is older (or the same version), performing upgrade (deploying files)\n"
    + NO_SELINUX
    + STOPPED
    + """\
DEL: /opt/corvan/zor/properties/scan.properties
RMDIR: /opt/corvan/zor/properties
Starting file extraction...
"""
)

DEPLOYMENT = (
    "Extracting configs to '/opt/corvan/zor/config'\n"
    + NO_SELINUX
    + """\
Customizing properties file: /opt/corvan/zor/config/Zor.properties
Looking for Trace Dir
Customizing property file: /opt/corvan/zor/config/ZorTrace.properties
File saved successfully
Updating file with variables /opt/corvan/zor/install/trawlcfg.sh
Updating: /opt/corvan/zor/install/trawlcfg.sh
Updating file with variables /opt/corvan/zor/install/rmdirs.sh
Updating: /opt/corvan/zor/install/rmdirs.sh
Created Corvan Common Dir='/usr/kel/corvan/common' result=0
"""
)

SHARED_TRANSCRIPT = (
    FRESH_START
    + "Extracting configs to '/opt/corvan/zor/config'\n"
    + NO_SELINUX
    + """\
Customizing property file: /opt/corvan/zor/config/Zor.properties
Customizing property file: /opt/corvan/zor/config/ZorTrace.properties
Updating file with variables /opt/corvan/zor/install/trawlcfg.sh
Updating: /opt/corvan/zor/install/trawlcfg.sh
Updating file with variables /opt/corvan/zor/install/rmdirs.sh
Updating: /opt/corvan/zor/install/rmdirs.sh
Saving INI file to /etc/zor/zor.ini
Created Corvan Common Dir='/usr/kel/corvan/common' result=0
Setting logs dir='/usr/kel/corvan/common/ZOR/logs'
Updating common trace path='/usr/kel/corvan/common' result=0
Exec '/opt/corvan/zor/bin/trawlcfg -s common_trace_path /usr/kel/corvan/common/ZOR/logs \
>/dev/null 2>&1' returned 0
Setting common trace path='/usr/kel/corvan/common/ZOR/logs' result=0
Installation successful, committing changes
Done.
"""
)

SHARED_TREE = """\
d 0755 /etc
d 0775 /etc/kel
d 0775 /etc/kel/corvan
d 0775 /etc/kel/corvan/common
d 0775 /etc/kel/corvan/common/cfg
f 0664 /etc/kel/corvan/common/cfg/log.properties
d 0755 /etc/zor
f 0644 /etc/zor/zor.ini
d 0755 /opt
d 0755 /opt/corvan
d 0755 /opt/corvan/zor
f 0644 /opt/corvan/zor/ZOR_files
d 0755 /opt/corvan/zor/bin
d 0777 /opt/corvan/zor/bin/etc
f 0755 /opt/corvan/zor/bin/libzorcore.so
f 0755 /opt/corvan/zor/bin/trawlcfg
f 0755 /opt/corvan/zor/bin/trawlfs
f 0755 /opt/corvan/zor/bin/trawlhw
d 0777 /opt/corvan/zor/cache_data
d 0755 /opt/corvan/zor/config
f 0644 /opt/corvan/zor/config/Zor.properties
f 0644 /opt/corvan/zor/config/ZorHWConfig.xml
f 0644 /opt/corvan/zor/config/ZorTrace.properties
d 0755 /opt/corvan/zor/config/xss
f 0755 /opt/corvan/zor/config/xss/schema.xss
d 0750 /opt/corvan/zor/install
f 0750 /opt/corvan/zor/install/rmdirs.sh
f 0750 /opt/corvan/zor/install/trawlcfg.sh
f 0640 /opt/corvan/zor/install/zor_install.properties
d 0755 /opt/corvan/zor/properties
f 0755 /opt/corvan/zor/properties/scan.properties
d 0777 /usr/kel
d 0777 /usr/kel/corvan
d 0777 /usr/kel/corvan/common
d 0777 /usr/kel/corvan/common/ZOR
d 0777 /usr/kel/corvan/common/ZOR/logs
"""

ANNS_TREE = """\
d 0755 /home/ann
d 0755 /home/ann/.zor
f 0644 /home/ann/.zor/zor.ini
d 0755 /home/ann/corvan
d 0755 /home/ann/corvan/zor
f 0644 /home/ann/corvan/zor/ZOR_files
d 0755 /home/ann/corvan/zor/bin
d 0777 /home/ann/corvan/zor/bin/etc
f 0755 /home/ann/corvan/zor/bin/libzorcore.so
f 0755 /home/ann/corvan/zor/bin/trawlcfg
f 0755 /home/ann/corvan/zor/bin/trawlfs
f 0755 /home/ann/corvan/zor/bin/trawlhw
d 0770 /home/ann/corvan/zor/cache_data
d 0755 /home/ann/corvan/zor/config
f 0644 /home/ann/corvan/zor/config/Zor.properties
f 0644 /home/ann/corvan/zor/config/ZorHWConfig.xml
f 0644 /home/ann/corvan/zor/config/ZorTrace.properties
d 0755 /home/ann/corvan/zor/config/xss
f 0755 /home/ann/corvan/zor/config/xss/schema.xss
d 0750 /home/ann/corvan/zor/install
f 0750 /home/ann/corvan/zor/install/rmdirs.sh
f 0750 /home/ann/corvan/zor/install/trawlcfg.sh
f 0640 /home/ann/corvan/zor/install/zor_install.properties
d 0755 /home/ann/corvan/zor/properties
f 0755 /home/ann/corvan/zor/properties/scan.properties
"""

SHARED_INDEX = """\
# File created by ZOR: 22/12/02zor_9.2.30.0000 installed on TIME
/opt/corvan/zor/bin/libzor.so
/opt/corvan/zor/bin/libzorcore.so
/opt/corvan/zor/bin/trawlcfg
/opt/corvan/zor/bin/trawlfs
/opt/corvan/zor/bin/trawlhw
/opt/corvan/zor/config/SingleUserMode
/opt/corvan/zor/config/Zor.properties
/opt/corvan/zor/config/Zor.tmp
/opt/corvan/zor/config/ZorHWConfig.xml
/opt/corvan/zor/config/ZorTrace.properties
/opt/corvan/zor/config/xss/schema.xss
/opt/corvan/zor/install/rmdirs.sh
/opt/corvan/zor/install/trawlcfg.sh
/opt/corvan/zor/properties/scan.properties
/opt/corvan/zor/zor.log
/opt/corvan/zor/zor.log.bak
/opt/corvan/zor/install/zor_install.properties
"""


def tree_with(listing, changes):
    """`listing` with changed, added or (None) missing paths: {"/etc": "d 0755"}."""
    nodes = {line[7:]: line[:6] for line in listing.splitlines()}
    nodes.update(changes)
    return "".join(
        f"{nodes[path]} {path}\n"
        for path in sorted(nodes, key=lambda p: p.split("/"))
        if nodes[path]
    )
