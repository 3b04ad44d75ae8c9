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

/// What a person does whom a client sent to `address`: where they end up.
export async function consent(address, user = 'alice', decision = 'allow') {
  const authorization = 'Basic ' + btoa(`${user}:${passwords[user]}`)
  const page = await fetch(address, { headers: { authorization }, redirect: 'manual' })
  const text = await page.text()
  // They have agreed before.
  if (page.status === 302) return new URL(page.headers.get('location'))
  assert.equal(page.status, 200, text)
  const fields = new URLSearchParams({ decision })
  for (const [, name, value] of text.matchAll(/type="hidden" name="([^"]+)" value="([^"]*)"/g)) {
    fields.set(name, unescape(value))
  }
  const answer = await fetch(issuer + '/oauth/authorize', {
    method: 'POST', headers: { authorization }, body: fields, redirect: 'manual' })
  assert.equal(answer.status, 303)
  return new URL(answer.headers.get('location'))
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
