// simple-oauth2, unchanged. It has no call for metadata, registration and
// introspection, and takes the PKCE parameters as it takes any other.

import simple from 'simple-oauth2'
import { createHash, randomBytes } from 'node:crypto'
import { strict as assert } from 'node:assert'
import { before, test } from 'node:test'
import * as service from '../service.mjs'

const name = service.versioned('simple-oauth2')
const record = (feature, how) => service.record(name, feature, how)
const base = new URL(service.issuer).pathname.replace(/\/$/, '')
let config

before(async () => {
  const made = await service.register({ client_name: 'simple-oauth2' })
  config = {
    client: { id: made.client_id, secret: made.client_secret },
    auth: { tokenHost: service.issuer, tokenPath: base + '/oauth/token',
      revokePath: base + '/oauth/revoke' },
  }
})

async function logIn(options = {}) {
  const client = new simple.AuthorizationCode({ ...config, options,
    auth: { ...config.auth, authorizePath: base + '/oauth/authorize' } })
  const verifier = randomBytes(32).toString('base64url')
  const address = client.authorizeURL({
    redirect_uri: service.callback, scope: 'profile', state: 'a state',
    code_challenge: createHash('sha256').update(verifier).digest('base64url'),
    code_challenge_method: 'S256' })
  const returned = (await service.consent(address)).searchParams
  assert.equal(returned.get('state'), 'a state')
  return client.getToken({ code: returned.get('code'), redirect_uri: service.callback,
    code_verifier: verifier })
}

test('code with PKCE', async () => {
  const { token } = await logIn()
  assert.equal(await service.whoami(token.access_token), 'alice')
  record('code with PKCE', 'yes, the challenge made by hand')
})

test('secret in the header', async () => {
  assert.equal((await logIn({ authorizationMethod: 'header' })).token.scope, 'profile')
  record('secret in the header')
})

test('secret in the body', async () => {
  assert.equal((await logIn({ authorizationMethod: 'body' })).token.scope, 'profile')
  record('secret in the body')
})

test('refresh', async () => {
  const old = await logIn()
  const { token } = await old.refresh()
  assert.equal(await service.whoami(token.access_token), 'alice')
  record('refresh')
})

test('client credentials', async () => {
  const { token } = await new simple.ClientCredentials(config).getToken({ scope: 'profile' })
  assert.equal(await service.whoami(token.access_token), config.client.id)
  record('client credentials')
})

test('revocation of both', async () => {
  const pair = await logIn()
  await pair.revokeAll()
  assert.equal(await service.whoami(pair.token.access_token), 401)
  record('revocation')
})
