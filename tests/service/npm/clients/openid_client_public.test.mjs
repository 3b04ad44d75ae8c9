// openid-client, unchanged, as an application on somebody's own computer: without
// a secret, on a port that the system has just given it, with OpenID Connect.

import * as client from 'openid-client'
import { createServer } from 'node:http'
import { strict as assert } from 'node:assert'
import { after, before, test } from 'node:test'
import * as service from '../service.mjs'

const name = service.versioned('openid-client') + ', public'
const record = (feature, how) => service.record(name, feature, how)
const scope = 'openid profile'
let config, listener, callback, arrived

before(async () => {
  listener = createServer((request, answer) => {
    arrived(new URL(request.url, callback))
    answer.end('You can close this window.')
  })
  await new Promise((resolve) => listener.listen(0, '127.0.0.1', resolve))
  callback = `http://127.0.0.1:${listener.address().port}/callback`
  config = await client.dynamicClientRegistration(new URL(service.issuer), {
    redirect_uris: ['http://127.0.0.1/callback'], client_name: 'On my computer', scope,
    token_endpoint_auth_method: 'none', post_logout_redirect_uris: ['http://127.0.0.1/bye'],
  }, client.None(), {
    initialAccessToken: service.initialToken, execute: [client.allowInsecureRequests] })
})

after(() => listener?.close())

/// The person's browser opens what the service has sent it to.
async function returned(address) {
  const arrival = new Promise((resolve) => { arrived = resolve })
  await (await fetch(await service.consent(address))).text()
  return arrival
}

async function logIn(build = client.buildAuthorizationUrl, more = {}) {
  const checks = { pkceCodeVerifier: client.randomPKCECodeVerifier(),
    expectedState: client.randomState(), expectedNonce: client.randomNonce() }
  const address = await build(config, {
    redirect_uri: callback, scope, state: checks.expectedState, nonce: checks.expectedNonce,
    code_challenge: await client.calculatePKCECodeChallenge(checks.pkceCodeVerifier),
    code_challenge_method: 'S256', ...more })
  return client.authorizationCodeGrant(config, await returned(address),
    { ...checks, idTokenExpected: true, ...(more.max_age && { maxAge: Number(more.max_age) }) })
}

test('metadata of OpenID Connect', () => {
  assert.equal(config.serverMetadata().issuer, service.issuer)
  record('OpenID Connect: discovery')
})

test('registration without a secret', () => {
  assert.equal(config.clientMetadata().client_secret, undefined)
  record('registration')
})

test('code with PKCE at a port that was not registered', async () => {
  assert.equal(await service.whoami((await logIn()).access_token), 'alice')
  record('public, any port')
  record('code with PKCE')
  record('issuer in the response')
})

test('a token that says who somebody is, with its nonce', async () => {
  const claims = (await logIn()).claims()
  assert.equal(claims.sub, 'alice')
  assert.equal(claims.aud, config.clientMetadata().client_id)
  record('OpenID Connect: login')
})

test('a login that is fresh', async () => {
  const claims = (await logIn(undefined, { max_age: '600' })).claims()
  assert.ok(Math.abs(Date.now() / 1000 - claims.auth_time) <= 600)
})

test('a pushed request', async () => {
  const tokens = await logIn(client.buildAuthorizationUrlWithPAR)
  assert.equal(await service.whoami(tokens.access_token), 'alice')
  record('pushed request')
})

test('refresh', async () => {
  const old = await logIn()
  const tokens = await client.refreshTokenGrant(config, old.refresh_token)
  assert.equal(await service.whoami(tokens.access_token), 'alice')
  assert.equal(tokens.claims()?.sub, 'alice')
  await assert.rejects(client.refreshTokenGrant(config, old.refresh_token),
    { error: 'invalid_grant' })
  record('refresh')
})

test('OpenID Connect: userinfo', async () => {
  const tokens = await logIn()
  const { preferred_username: user } = await client.fetchUserInfo(config, tokens.access_token,
    tokens.claims().sub)
  assert.equal(user, 'alice')
  record('OpenID Connect: userinfo')
})

test('revocation', async () => {
  const tokens = await logIn()
  await client.tokenRevocation(config, tokens.refresh_token)
  assert.equal(await service.whoami(tokens.access_token), 401)
  record('revocation')
})

test('logout', async () => {
  const tokens = await logIn()
  const address = client.buildEndSessionUrl(config, {
    id_token_hint: tokens.id_token, post_logout_redirect_uri: 'http://127.0.0.1/bye', state: 's' })
  assert.equal((await service.consent(address)).href, 'http://127.0.0.1/bye?state=s')
  record('OpenID Connect: sign-out')
})
