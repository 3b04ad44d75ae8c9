# Where there is no systemd: removes expired grant codes every hour, and tokens
# whose refresh token has had its 30 days. The program goes on as the owner of
# the state folder.
17 * * * * root [ -d /run/systemd/system ] || [ ! -x /usr/libexec/keldoauth/keldoauth-purge ] || /usr/libexec/keldoauth/keldoauth-purge >/dev/null
