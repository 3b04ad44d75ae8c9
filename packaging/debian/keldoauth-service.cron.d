# Where there is no systemd: renews the keys that sign who somebody is once a
# quarter.
43 5 * * * root [ -d /run/systemd/system ] || [ ! -e /etc/keldoauth/signing.keys.json ] || /usr/sbin/keldoauth-service keys rotate --if-older-than 90 >/dev/null
