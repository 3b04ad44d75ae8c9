// openid-client with OpenID Connect, unchanged: it finds the configuration, registers
// without naming a scope, and checks the tokens against the published keys.

import * as client from 'openid-client'
import { strict as assert } from 'node:assert'
import { before, test } from 'node:test'
import * as service from '../service.mjs'

const name = service.versioned('openid-client')
const server = new URL(service.issuer)
const record = (feature, how) => service.record(name, feature, how)
const goodbye = 'https://goodbye.example/done'
let config

before(async () => {
  config = await client.dynamicClientRegistration(server, {
    redirect_uris: [service.callback], client_name: 'openid-client', require_auth_time: true,
    post_logout_redirect_uris: [goodbye], id_token_signed_response_alg: 'RS256',
  }, undefined, { initialAccessToken: service.initialToken, algorithm: 'oidc',
    execute: [client.allowInsecureRequests, client.enableNonRepudiationChecks] })
})

async function logIn(parameters = {}) {
  const verifier = client.randomPKCECodeVerifier()
  const [state, nonce] = [client.randomState(), client.randomNonce()]
  const address = client.buildAuthorizationUrl(config, {
    redirect_uri: service.callback, scope: 'openid profile email', state, nonce,
    code_challenge: await client.calculatePKCECodeChallenge(verifier),
    code_challenge_method: 'S256', ...parameters,
  })
  return client.authorizationCodeGrant(config, await service.consent(address), {
    pkceCodeVerifier: verifier, expectedState: state, expectedNonce: nonce,
    maxAge: parameters.max_age, idTokenExpected: true })
}

test('discovery', () => {
  assert.equal(config.serverMetadata().issuer, service.issuer)
  record('OpenID Connect: discovery')
})

test('login', async () => {
  const claims = (await logIn({ max_age: 600 })).claims()
  assert.equal(claims.sub, 'alice')
  assert.equal(claims.aud, config.clientMetadata().client_id)
  record('OpenID Connect: login')
})

test('userinfo', async () => {
  const tokens = await logIn()
  const seen = await client.fetchUserInfo(config, tokens.access_token, tokens.claims().sub)
  assert.equal(seen.preferred_username, 'alice')
  record('OpenID Connect: userinfo')
})

test('refresh', async () => {
  const tokens = await client.refreshTokenGrant(config, (await logIn()).refresh_token)
  assert.equal(tokens.claims().sub, 'alice')
})

test('sign-out', async () => {
  const address = client.buildEndSessionUrl(config, {
    id_token_hint: (await logIn()).id_token, post_logout_redirect_uri: goodbye, state: 'x' })
  const answer = await fetch(address, { redirect: 'manual' })
  assert.equal(answer.headers.get('location'), goodbye + '?state=x')
  record('OpenID Connect: sign-out')
})
