// The service under test, and the person in front of the browser: no client
// library here.

import { appendFileSync } from 'node:fs'
import { strict as assert } from 'node:assert'
import { createRequire } from 'node:module'

export const issuer = process.env.SERVICE_ISSUER
export const initialToken = process.env.SERVICE_INITIAL_TOKEN
export const passwords = Object.fromEntries(
  process.env.SERVICE_USERS.trim().split(' ').map((pair) => pair.split(':')))
export const callback = 'http://127.0.0.1:9/callback'

const require = createRequire(import.meta.url)

export function versioned(name) {
  return `${name} ${require(`./node_modules/${name}/package.json`).version}`
}

/// One cell of the table of clients and features.
export function record(client, feature, how = 'yes') {
  const path = process.env.SERVICE_REPORT
  if (path) appendFileSync(path, `${client}\t${feature}\t${how}\n`)
}

function unescape(text) {
  const characters = { '&lt;': '<', '&gt;': '>', '&quot;': '"', '&#39;': "'", '&amp;': '&' }
  return text.replace(/&(lt|gt|quot|#39|amp);/g, (entity) => characters[entity])
}

const cookies = {}

/// A request of a person's browser, which keeps the service's cookies.
async function browse(address, user, form) {
  const jar = (cookies[user] ??= new Map())
  const headers = { cookie: [...jar].map((pair) => pair.join('=')).join('; ') }
  if (process.env.SERVICE_SIGN_IN === 'web-server') {
    headers.authorization = 'Basic ' + btoa(`${user}:${passwords[user]}`)
  }
  const answer = await fetch(address, {
    method: form ? 'POST' : 'GET', headers, body: form, redirect: 'manual' })
  for (const cookie of answer.headers.getSetCookie()) {
    const [, name, value] = cookie.match(/^([^=]+)=([^;]*)/)
    if (value) jar.set(name, value)
    else jar.delete(name)
  }
  return answer
}

function hiddenFields(page) {
  return [...page.matchAll(/type="hidden" name="([^"]+)" value="([^"]*)"/g)]
    .map(([, name, value]) => [name, unescape(value)])
}

/// What a person does whom a client sent to `address`, signed in or not, asked or
/// not: where they end up.
export async function consent(address, user = 'alice', decision = 'allow') {
  for (;;) {
    let answer = await browse(address, user)
    if (answer.status === 200) {
      const page = await answer.text()
      const given = page.includes('name="password"')
        ? { user, password: passwords[user] } : { decision }
      const action = new URL(unescape(page.match(/<form[^>]* action="([^"]+)"/)[1]), address)
      answer = await browse(action, user,
        new URLSearchParams([...hiddenFields(page), ...Object.entries(given)]))
    }
    assert.ok([302, 303].includes(answer.status), await answer.text())
    address = new URL(answer.headers.get('location'), address)
    if (address.origin !== new URL(issuer).origin) return address
  }
}

export async function register(metadata = {}) {
  const answer = await fetch(issuer + '/oauth/register', {
    method: 'POST',
    headers: { 'content-type': 'application/json', authorization: `Bearer ${initialToken}` },
    body: JSON.stringify({ redirect_uris: [callback], scope: 'profile files.read', ...metadata }),
  })
  assert.equal(answer.status, 201)
  return answer.json()
}

export async function whoami(token) {
  const answer = await fetch(issuer + '/api/whoami', {
    headers: { authorization: `Bearer ${token}` } })
  return answer.status === 200 ? (await answer.json()).sub : answer.status
}
