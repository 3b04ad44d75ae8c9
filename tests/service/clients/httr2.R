# A script that lets its user in with httr2, unchanged: with a secret and without,
# on a port that httr2 draws. Prints what it got, a line for each way.

library(httr2)
options(rlang_interactive = TRUE, browser = Sys.getenv("BROWSER"))

issuer <- Sys.getenv("SERVICE_ISSUER")
at <- function(path) paste0(issuer, path)
given <- commandArgs(trailingOnly = TRUE)
say <- function(way, token) cat(way, token$access_token, "\n")

client <- function(auth = "header", id = given[1], secret = given[2]) {
  oauth_client(id = id, token_url = at("/oauth/token"), secret = secret, auth = auth)
}

log_in <- function(client) {
  oauth_flow_auth_code(client, at("/oauth/authorize"), scope = "profile",
                       host_name = "127.0.0.1")
}

say("header", log_in(client()))

# It takes the very refresh token back only, and says so; req_oauth_auth_code()
# keeps what it gets, but calls this for an expired token alone.
given_back <- log_in(client())$refresh_token
refused <- tryCatch(oauth_flow_refresh(client(), given_back), error = conditionMessage)
cat("oauth_flow_refresh", gsub("[[:space:]]", "_", refused), "\n")
token_refresh <- getFromNamespace("token_refresh", "httr2")
say("refresh", token_refresh(client(), log_in(client())$refresh_token))

say("body", log_in(client("body")))
say("public", log_in(client("body", id = given[3], secret = NULL)))
say("credentials", oauth_flow_client_credentials(client(), scope = "profile"))

seen <- request(at("/api/whoami"))
seen <- req_auth_bearer_token(seen, log_in(client())$access_token)
cat("resource", resp_body_json(req_perform(seen))$sub, "\n")
