// openid-client, unchanged.

import * as client from 'openid-client'
import { strict as assert } from 'node:assert'
import { before, test } from 'node:test'
import * as service from '../service.mjs'

const name = service.versioned('openid-client')
const server = new URL(service.issuer)
const insecure = { algorithm: 'oauth2', execute: [client.allowInsecureRequests] }
const record = (feature, how) => service.record(name, feature, how)
let config

before(async () => {
  config = await client.dynamicClientRegistration(server, {
    redirect_uris: [service.callback], client_name: 'openid-client', scope: 'profile files.read',
  }, undefined, { initialAccessToken: service.initialToken, ...insecure })
})

async function logIn(configuration = config) {
  const verifier = client.randomPKCECodeVerifier()
  const state = client.randomState()
  const address = client.buildAuthorizationUrl(configuration, {
    redirect_uri: service.callback, scope: 'profile', state,
    code_challenge: await client.calculatePKCECodeChallenge(verifier),
    code_challenge_method: 'S256',
  })
  return client.authorizationCodeGrant(configuration, await service.consent(address), {
    pkceCodeVerifier: verifier, expectedState: state })
}

async function withAuthentication(method) {
  const { client_id: id, client_secret: secret } = config.clientMetadata()
  return client.discovery(server, id, undefined, method(secret), insecure)
}

test('metadata', () => {
  assert.equal(config.serverMetadata().issuer, service.issuer)
  record('metadata')
})

test('registration', () => {
  assert.equal(config.clientMetadata().client_id.length, 64)
  record('registration')
})

test('code with PKCE, state and issuer', async () => {
  const tokens = await logIn()
  assert.equal(await service.whoami(tokens.access_token), 'alice')
  record('code with PKCE')
  // The library insists on `iss` because the metadata announces it.
  record('issuer in the response')
})

test('refusal', async () => {
  const address = client.buildAuthorizationUrl(config, {
    redirect_uri: service.callback, scope: 'profile', code_challenge_method: 'S256',
    prompt: 'consent',
    code_challenge: await client.calculatePKCECodeChallenge(client.randomPKCECodeVerifier()) })
  await assert.rejects(
    client.authorizationCodeGrant(config, await service.consent(address, 'alice', 'refuse')),
    { error: 'access_denied' })
})

for (const [method, feature] of [[client.ClientSecretPost, 'secret in the body'],
  [client.ClientSecretBasic, 'secret in the header']]) {
  test(feature, async () => {
    const tokens = await logIn(await withAuthentication(method))
    assert.equal(tokens.scope, 'profile')
    record(feature)
  })
}

test('refresh', async () => {
  const old = await logIn()
  const tokens = await client.refreshTokenGrant(config, old.refresh_token)
  assert.equal(await service.whoami(tokens.access_token), 'alice')
  await assert.rejects(client.refreshTokenGrant(config, old.refresh_token),
    { error: 'invalid_grant' })
  record('refresh')
})

test('client credentials', async () => {
  const tokens = await client.clientCredentialsGrant(config, { scope: 'profile' })
  assert.equal(await service.whoami(tokens.access_token), config.clientMetadata().client_id)
  record('client credentials')
})

test('introspection', async () => {
  const tokens = await logIn()
  assert.equal((await client.tokenIntrospection(config, tokens.access_token)).active, true)
  assert.equal((await client.tokenIntrospection(config, 'nothing')).active, false)
  record('introspection')
})

test('revocation', async () => {
  const tokens = await logIn()
  await client.tokenRevocation(config, tokens.access_token)
  assert.equal(await service.whoami(tokens.access_token), 401)
  record('revocation')
})

test('protected resource', async () => {
  const tokens = await logIn()
  const resource = new URL(service.issuer + '/api/whoami')
  const answer = await client.fetchProtectedResource(config, tokens.access_token, resource, 'GET')
  assert.equal((await answer.json()).sub, 'alice')
  await assert.rejects(
    client.fetchProtectedResource(config, 'nothing', resource, 'GET'),
    (error) => error.cause[0].parameters.error === 'invalid_token')
  record('bearer challenge')
})
