// oidc-provider with one token of one user, all in its memory.
// Usage: node provider.mjs PORT     prints "token TEXT" once it listens

import Provider from "oidc-provider";

const port = Number(process.argv[2]);
const provider = new Provider(`http://127.0.0.1:${port}`, {
  clients: [
    {
      client_id: "frame",
      client_secret: crypto.randomUUID(),
      redirect_uris: ["https://photos.example.org/callback"],
    },
  ],
  cookies: { keys: [crypto.randomUUID()] },
  features: { devInteractions: { enabled: false } },
  findAccount: (_, id) => ({ accountId: id, claims: () => ({ sub: id }) }),
});

const grant = new provider.Grant({ accountId: "alice", clientId: "frame" });
grant.addOIDCScope("openid");
const token = new provider.AccessToken({
  accountId: "alice",
  client: await provider.Client.find("frame"),
  grantId: await grant.save(),
  gty: "authorization_code",
  scope: "openid",
});
const text = await token.save();
provider.listen(port, "127.0.0.1", () => console.log(`token ${text}`));
