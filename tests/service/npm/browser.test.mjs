// A person with a real browser: logs in, refuses, allows, and administers the
// box. Every page is looked at in two widths and both colour schemes (the
// pictures go to SERVICE_SCREENSHOTS) and searched for accessibility faults.

import { chromium } from 'playwright-core'
import { createHash, randomBytes } from 'node:crypto'
import { createServer } from 'node:http'
import { mkdirSync } from 'node:fs'
import { strict as assert } from 'node:assert'
import { after, before, test } from 'node:test'
import { createRequire } from 'node:module'
import * as service from './service.mjs'

const pictures = process.env.SERVICE_SCREENSHOTS
const looks = [
  { name: 'desktop-light', width: 1280, height: 900, colorScheme: 'light' },
  { name: 'desktop-dark', width: 1280, height: 900, colorScheme: 'dark' },
  { name: 'phone-light', width: 390, height: 844, colorScheme: 'light' },
  { name: 'phone-dark', width: 390, height: 844, colorScheme: 'dark' },
]

let browser, landing, landingAddress, client, onward
const arrived = []

before(async () => {
  landing = createServer((request, answer) => {
    arrived.push(new URL(request.url, landingAddress))
    if (onward) return answer.writeHead(302, { location: onward }).end()
    answer.setHeader('content-type', 'text/html')
    answer.end('<!DOCTYPE html><html lang="en"><title>Client</title><h1>Welcome back</h1>')
  })
  await new Promise((resolve) => landing.listen(0, '127.0.0.1', resolve))
  landingAddress = `http://127.0.0.1:${landing.address().port}`
  client = await service.register({ redirect_uris: [landingAddress + '/callback'],
    client_name: 'Holiday Photos', scope: 'profile photos.read files.read' })
  browser = await chromium.launch({
    executablePath: '/usr/bin/chromium', headless: true,
    args: ['--no-sandbox', '--disable-gpu', '--disable-quic', '--no-first-run',
      '--disable-background-networking', '--disable-component-update', '--disable-sync'],
  })
})

after(async () => {
  await browser?.close()
  landing?.close()
})

/// A fresh profile per person, which ends with its work.
async function as(user, work, options = {}) {
  const context = await browser.newContext({
    httpCredentials: { username: user, password: service.passwords[user] },
    javaScriptEnabled: true, ...options })
  const page = await context.newPage()
  const complaints = []
  page.on('console', (message) => {
    if (['error', 'warning'].includes(message.type())) complaints.push(message.text())
  })
  page.on('pageerror', (error) => complaints.push(String(error)))
  try {
    await work(page)
    // What the form's own refusals say is no fault of the page.
    assert.deepEqual(complaints.filter((text) => !/status of 40[0-9]/.test(text)), [])
  } finally {
    await context.close()
  }
}

/// Pictures of the page in every look, and no serious fault in any.
async function inspect(page, name) {
  for (const look of looks) {
    await page.setViewportSize({ width: look.width, height: look.height })
    await page.emulateMedia({ colorScheme: look.colorScheme })
    const overflow = await page.evaluate(
      () => document.documentElement.scrollWidth - document.documentElement.clientWidth)
    assert.ok(overflow <= 0, `${name} in ${look.name} is ${overflow} pixels too wide`)
    if (pictures) {
      mkdirSync(pictures, { recursive: true })
      await page.screenshot({ path: `${pictures}/${name}-${look.name}.png`, fullPage: true })
    }
    const { violations } = await audit(page)
    const grave = violations.filter(({ impact }) => ['serious', 'critical'].includes(impact))
    assert.deepEqual(grave.map(({ id, nodes }) => [id, nodes.map((node) => node.html)]), [],
      `${name} in ${look.name}`)
  }
}

/// The page's policy allows no script, ours neither: the debugger brings it in.
async function audit(page) {
  await page.evaluate(`if (!window.axe) { ${axeSource()} }`)
  return page.evaluate(() => window.axe.run(document))
}

let source
function axeSource() {
  source ??= createRequire(import.meta.url)('axe-core').source
  return source
}

function question(state) {
  const address = new URL(service.issuer + '/oauth/authorize')
  address.search = new URLSearchParams({
    client_id: client.client_id, redirect_uri: landingAddress + '/callback',
    response_type: 'code', scope: 'profile photos.read', state,
    code_challenge: createHash('sha256').update(randomBytes(32)).digest('base64url'),
    code_challenge_method: 'S256' })
  return address.href
}

test('consent page says who asks for what, and looks right', async () => {
  await as('alice', async (page) => {
    await page.goto(question('s'))
    const text = await page.textContent('main')
    for (const part of ['alice', 'Holiday Photos', landingAddress, 'See your photo albums']) {
      assert.ok(text.includes(part), part)
    }
    await inspect(page, 'consent')
  })
})

for (const [button, check] of [
  ['Refuse', (returned) => assert.equal(returned.get('error'), 'access_denied')],
  ['Allow', (returned) => assert.equal(returned.get('code').length, 64)],
]) {
  test(`${button} lands at the client with the state`, async () => {
    await as('alice', async (page) => {
      await page.goto(question(`state of ${button}`))
      await page.getByRole('button', { name: button }).click()
      await page.waitForURL(landingAddress + '/**')
      assert.equal(await page.textContent('h1'), 'Welcome back')
      const returned = arrived.filter((url) => url.pathname === '/callback').at(-1).searchParams
      check(returned)
      assert.equal(returned.get('state'), `state of ${button}`)
      assert.equal(returned.get('iss'), service.issuer)
    })
  })
}

test('an application may send the user on to where it likes', async () => {
  const home = createServer((request, answer) => {
    answer.setHeader('content-type', 'text/html')
    answer.end('<!DOCTYPE html><html lang="en"><title>Home</title><h1>At home</h1>')
  })
  await new Promise((resolve) => home.listen(0, '127.0.0.1', resolve))
  onward = `http://127.0.0.1:${home.address().port}/`
  try {
    await as('alice', async (page) => {
      await page.goto(question('onward'))
      await page.getByRole('button', { name: 'Allow' }).click()
      await page.waitForURL(onward, { timeout: 10000 })
      assert.equal(await page.textContent('h1'), 'At home')
    })
  } finally {
    onward = undefined
    home.close()
  }
})

test('consent works by keyboard', async () => {
  await as('bob', async (page) => {
    await page.goto(question('keys'))
    await page.keyboard.press('Tab')
    assert.equal(await page.evaluate(() => document.activeElement.textContent), 'Allow')
    await page.keyboard.press('Enter')
    await page.waitForURL(landingAddress + '/**')
  })
})

test('an unknown application gets a page, not a redirect', async () => {
  await as('alice', async (page) => {
    await page.goto(question('s').replace(/client_id=[^&]+/, 'client_id=unknown'))
    assert.ok(page.url().startsWith(service.issuer))
    assert.ok((await page.textContent('main')).includes('not known'))
    await inspect(page, 'refused')
  })
})

test('an administrator registers, disables, enables, and removes, without JavaScript', async () => {
  await as('admin', async (page) => {
    await page.goto(service.issuer + '/')
    await page.getByLabel('Name', { exact: true }).fill("Anna's <b>Reader</b>")
    await page.getByLabel('Redirect address').fill('https://reader.example/cb')
    await page.getByLabel('See and download your files').check()
    await page.getByRole('button', { name: 'Register' }).click()
    assert.match(await page.textContent('.secret'), /^[0-9a-f]{64}$/)
    await page.getByRole('link', { name: 'Done' }).click()
    const item = page.getByRole('listitem').filter({ hasText: "Anna's <b>Reader</b>" })
    await item.getByRole('button', { name: 'Disable' }).click()
    assert.ok((await page.textContent('.notice')).includes('disabled'))
    await item.getByText('Disabled').waitFor()
    await item.getByRole('button', { name: 'Enable' }).click()
    await item.getByText('Enabled').waitFor()
    await item.locator('summary').click()
    await item.getByRole('button', { name: 'Remove for good' }).click()
    assert.ok((await page.textContent('.notice')).includes('removed'))
    assert.equal(await item.count(), 0)
  }, { javaScriptEnabled: false })
})

test('an administrator revokes the access of a user', async () => {
  await as('admin', async (page) => {
    await page.goto(service.issuer + '/admin')
    await page.getByRole('link', { name: 'Access' }).click()
    await page.getByRole('link', { name: 'alice' }).click()
    const revoke = page.getByRole('button', { name: /Revoke/ })
    const count = await revoke.count()
    assert.ok(count > 0)
    await inspect(page, 'access')
    await revoke.first().click()
    assert.ok((await page.textContent('.notice')).includes('revoked'))
    assert.equal(await revoke.count(), count - 1)
  })
})

test('every page of the administrator looks right', async () => {
  await service.register({ client_name: 'Kitchen Radio', scope: 'profile' })
  await as('admin', async (page) => {
    for (const [name, path] of [['applications', '/admin'], ['users', '/admin?view=access'],
      ['log', '/admin?view=log'], ['storage', '/admin?view=storage']]) {
      await page.goto(service.issuer + path)
      await inspect(page, name)
    }
    await page.goto(service.issuer + '/admin')
    await page.locator('summary').first().click()
    await inspect(page, 'removing')
    await page.getByLabel('Name', { exact: true }).fill('Printer')
    await page.getByLabel('Redirect address').fill('http://printer.example/')
    await page.getByRole('button', { name: 'Register' }).click()
    assert.equal(await page.getByLabel('Name', { exact: true }).inputValue(), 'Printer')
    await inspect(page, 'fault')
    await page.getByLabel('Redirect address').fill('https://printer.example/')
    await page.getByRole('button', { name: 'Register' }).click()
    await page.locator('.secret').waitFor()
    await inspect(page, 'secret')
  })
})
