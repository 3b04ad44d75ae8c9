# Where there is no systemd: removes expired grant codes every hour, and tokens
# whose refresh token has had its 30 days.
17 * * * * root [ -d /run/systemd/system ] || [ ! -e /var/packages/Corvane/target/etc/oauth.db ] || { /usr/sbin/keldoauth code purge --yes && /usr/sbin/keldoauth token purge --yes --grace 2592000; } >/dev/null
