// @auth/core, unchanged: a web application that lets people in with this service,
// once as it does with any OAuth service, once with OpenID Connect as it comes.

import { Auth } from '@auth/core'
import { randomBytes } from 'node:crypto'
import { strict as assert } from 'node:assert'
import { test } from 'node:test'
import * as service from '../service.mjs'

const home = 'http://127.0.0.1:9'
const secret = randomBytes(32).toString('hex')

/// An application with this one provider, and one visitor of it.
class Application {
  cookies = new Map()

  constructor(provider) {
    this.config = { providers: [provider], secret, basePath: '/auth', trustHost: true,
      logger: { error: (fault) => { this.fault = fault } } }
  }

  async visit(address, form) {
    const cookie = [...this.cookies].map((pair) => pair.join('=')).join('; ')
    const answer = await Auth(new Request(new URL(address, home), {
      method: form ? 'POST' : 'GET', headers: { cookie }, body: form }), this.config)
    for (const text of answer.headers.getSetCookie()) {
      const [, name, value] = text.match(/^([^=]+)=([^;]*)/)
      this.cookies.set(name, value)
    }
    return answer
  }

  /// Who the visitor is then.
  async logIn() {
    const { csrfToken } = await (await this.visit('/auth/csrf')).json()
    const start = await this.visit('/auth/signin/box', new URLSearchParams({ csrfToken }))
    assert.equal(start.status, 302, this.fault)
    const callback = await service.consent(new URL(start.headers.get('location')))
    await this.visit(callback)
    if (this.fault) throw this.fault.cause?.err ?? this.fault
    return (await (await this.visit('/auth/session')).json()).user
  }
}

async function provider(type, more) {
  const client = await service.register({ client_name: '@auth/core',
    redirect_uris: [`${home}/auth/callback/box`], scope: 'openid profile' })
  return { id: 'box', name: 'The box', type, issuer: service.issuer,
    clientId: client.client_id, clientSecret: client.client_secret, ...more }
}

const name = service.versioned('@auth/core')

test('oauth', async () => {
  const user = await new Application(await provider('oauth', {
    authorization: { url: service.issuer + '/oauth/authorize', params: { scope: 'profile' } },
    token: service.issuer + '/oauth/token',
    userinfo: service.issuer + '/api/whoami',
    profile: ({ sub }) => ({ id: sub, name: sub }),
  })).logIn()
  assert.equal(user.name, 'alice')
  service.record(`${name}, oauth`, 'code with PKCE')
  service.record(`${name}, oauth`, 'issuer in the response')
  service.record(`${name}, oauth`, 'secret in the header')
})

test('oauth with the secret in the body', async () => {
  const user = await new Application(await provider('oauth', {
    authorization: { url: service.issuer + '/oauth/authorize', params: { scope: 'profile' } },
    token: service.issuer + '/oauth/token',
    userinfo: service.issuer + '/api/whoami',
    client: { token_endpoint_auth_method: 'client_secret_post' },
    profile: ({ sub }) => ({ id: sub, name: sub }),
  })).logIn()
  assert.equal(user.name, 'alice')
  service.record(`${name}, oauth`, 'secret in the body')
})

test('oauth has to know the issuer, which the answer names', async () => {
  const application = new Application(await provider('oauth', {
    authorization: { url: service.issuer + '/oauth/authorize', params: { scope: 'profile' } },
    token: service.issuer + '/oauth/token',
    userinfo: service.issuer + '/api/whoami',
    issuer: undefined,
  }))
  await assert.rejects(application.logIn(), /"iss" \(issuer\) response parameter/)
})

test('oidc, with nothing set but the issuer', async () => {
  const user = await new Application(await provider('oidc', {})).logIn()
  assert.equal(user.name, 'alice')
  for (const feature of ['OpenID Connect: discovery', 'code with PKCE', 'issuer in the response',
    'secret in the header', 'OpenID Connect: login']) {
    service.record(`${name}, oidc`, feature)
  }
})

test('oidc with state and nonce, and the claims from userinfo', async () => {
  const user = await new Application(await provider('oidc', {
    checks: ['pkce', 'state', 'nonce'], idToken: false })).logIn()
  assert.equal(user.name, 'alice')
  service.record(`${name}, oidc`, 'OpenID Connect: userinfo')
})
