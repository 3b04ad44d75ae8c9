// oauth4webapi, unchanged.

import * as oauth from 'oauth4webapi'
import { strict as assert } from 'node:assert'
import { before, test } from 'node:test'
import * as service from '../service.mjs'

const name = service.versioned('oauth4webapi')
const insecure = { [oauth.allowInsecureRequests]: true }
const record = (feature, how) => service.record(name, feature, how)
let server, client, authentication

before(async () => {
  const issuer = new URL(service.issuer)
  server = await oauth.processDiscoveryResponse(issuer,
    await oauth.discoveryRequest(issuer, { algorithm: 'oauth2', ...insecure }))
  client = await oauth.processDynamicClientRegistrationResponse(
    await oauth.dynamicClientRegistrationRequest(server, {
      redirect_uris: [service.callback], client_name: 'oauth4webapi', scope: 'profile files.read',
    }, { initialAccessToken: service.initialToken, ...insecure }))
  authentication = oauth.ClientSecretBasic(client.client_secret)
})

async function logIn(how = authentication) {
  const verifier = oauth.generateRandomCodeVerifier()
  const state = oauth.generateRandomState()
  const address = new URL(server.authorization_endpoint)
  address.search = new URLSearchParams({
    client_id: client.client_id, redirect_uri: service.callback, response_type: 'code',
    scope: 'profile', state, code_challenge_method: 'S256',
    code_challenge: await oauth.calculatePKCECodeChallenge(verifier) })
  const parameters = oauth.validateAuthResponse(server, client, await service.consent(address),
    state)
  return oauth.processAuthorizationCodeResponse(server, client,
    await oauth.authorizationCodeGrantRequest(server, client, how, parameters, service.callback,
      verifier, insecure))
}

test('metadata', () => {
  assert.equal(server.issuer, service.issuer)
  record('metadata')
})

test('registration', () => {
  assert.equal(client.token_endpoint_auth_method, 'client_secret_basic')
  record('registration')
})

test('code with PKCE, state and issuer', async () => {
  assert.equal(await service.whoami((await logIn()).access_token), 'alice')
  record('code with PKCE')
  record('issuer in the response')
})

test('secret in the header', async () => {
  await logIn(oauth.ClientSecretBasic(client.client_secret))
  record('secret in the header')
})

test('secret in the body', async () => {
  await logIn(oauth.ClientSecretPost(client.client_secret))
  record('secret in the body')
})

test('refresh', async () => {
  const old = await logIn()
  const tokens = await oauth.processRefreshTokenResponse(server, client,
    await oauth.refreshTokenGrantRequest(server, client, authentication, old.refresh_token,
      insecure))
  assert.equal(await service.whoami(tokens.access_token), 'alice')
  record('refresh')
})

test('client credentials', async () => {
  const tokens = await oauth.processClientCredentialsResponse(server, client,
    await oauth.clientCredentialsGrantRequest(server, client, authentication,
      { scope: 'profile' }, insecure))
  assert.equal(await service.whoami(tokens.access_token), client.client_id)
  record('client credentials')
})

test('introspection', async () => {
  const tokens = await logIn()
  const seen = await oauth.processIntrospectionResponse(server, client,
    await oauth.introspectionRequest(server, client, authentication, tokens.access_token,
      insecure))
  assert.equal(seen.username, 'alice')
  record('introspection')
})

test('revocation', async () => {
  const tokens = await logIn()
  await oauth.processRevocationResponse(
    await oauth.revocationRequest(server, client, authentication, tokens.refresh_token, insecure))
  assert.equal(await service.whoami(tokens.access_token), 401)
  record('revocation')
})

test('protected resource', async () => {
  const tokens = await logIn()
  const resource = new URL(service.issuer + '/api/whoami')
  const answer = await oauth.protectedResourceRequest(tokens.access_token, 'GET', resource,
    undefined, undefined, insecure)
  assert.equal((await answer.json()).sub, 'alice')
  await assert.rejects(
    oauth.protectedResourceRequest('nothing', 'GET', resource, undefined, undefined, insecure),
    (error) => error.cause[0].parameters.error === 'invalid_token')
  record('bearer challenge')
})
