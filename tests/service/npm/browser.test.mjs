// A person with a real browser: logs in, refuses, allows, takes back, and
// administers the box. Every page is looked at in two widths and both colour
// schemes, enlarged twofold on a phone, in forced colours and on paper (the
// pictures go to SERVICE_SCREENSHOTS), and searched for accessibility faults.

import { chromium } from 'playwright-core'
import { createHash, randomBytes } from 'node:crypto'
import { execFileSync } from 'node:child_process'
import { createServer } from 'node:http'
import { mkdirSync, readFileSync, writeFileSync } from 'node:fs'
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
  // What a phone of 390 pixels has left at 200 %.
  { name: 'phone-enlarged', width: 195, height: 422, colorScheme: 'light' },
  { name: 'forced-colors', width: 1280, height: 900, colorScheme: 'dark', forcedColors: 'active' },
  // A4 at 96 pixels an inch, without the margins.
  { name: 'paper', width: 718, height: 1046, colorScheme: 'dark', media: 'print' },
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
    await page.emulateMedia({ colorScheme: look.colorScheme, media: look.media ?? 'screen',
      forcedColors: look.forcedColors ?? 'none' })
    const { overflow, wide } = await page.evaluate(measure)
    assert.ok(overflow <= 0, `${name} in ${look.name} is ${overflow} pixels too wide: ${wide}`)
    if (pictures) {
      mkdirSync(pictures, { recursive: true })
      await page.screenshot({ path: `${pictures}/${name}-${look.name}.png`, fullPage: true })
    }
    if (look.media === 'print') continue
    const { violations } = await audit(page, look)
    const grave = violations.filter(({ impact }) => ['serious', 'critical'].includes(impact))
    assert.deepEqual(grave.map(({ id, nodes }) => [id, nodes.map((node) => node.html)]), [],
      `${name} in ${look.name}`)
  }
  await page.setViewportSize({ width: looks[0].width, height: looks[0].height })
  await page.emulateMedia({ colorScheme: 'light', media: 'screen', forcedColors: 'none' })
}

/// How much too wide the page is, and what makes it so.
function measure() {
  const { scrollWidth, clientWidth } = document.documentElement
  const wide = [...document.querySelectorAll('body *')]
    .filter((element) => element.getBoundingClientRect().right > clientWidth + 1)
    .map((element) => `${element.tagName} ${element.className}`)
  return { overflow: scrollWidth - clientWidth, wide: wide.slice(0, 5).join(', ') }
}

/// What the Tab key reaches, in this order, until it leaves the page: names or texts.
async function tabStops(page, most = 60) {
  const stops = []
  await page.reload()
  for (let i = 0; i < most; ++i) {
    await page.keyboard.press('Tab')
    const stop = await page.evaluate(() => {
      const at = document.activeElement
      if (!at || at === document.body) return null
      const style = getComputedStyle(at)
      return { text: at.getAttribute('aria-label') || at.name || at.textContent.trim(),
        isMarked: style.outlineStyle !== 'none' && parseFloat(style.outlineWidth) >= 2 }
    })
    if (!stop) break
    assert.ok(stop.isMarked, `${stop.text} has no visible focus`)
    stops.push(stop.text)
  }
  return stops
}

/// The page's policy allows no script, ours neither: the debugger brings it in.
async function audit(page, look) {
  await page.evaluate(`if (!window.axe) { ${axeSource()} }`)
  // Forced colours are the reader's own, and not what the style computes to.
  const rules = { 'color-contrast': { enabled: !look.forcedColors } }
  return page.evaluate((rules) => window.axe.run(document, { rules }), rules)
}

let source
function axeSource() {
  source ??= createRequire(import.meta.url)('axe-core').source
  return source
}

function challengeOf(verifier) {
  return createHash('sha256').update(verifier).digest('base64url')
}

function question(state) {
  const address = new URL(service.issuer + '/oauth/authorize')
  address.search = new URLSearchParams({
    client_id: client.client_id, redirect_uri: landingAddress + '/callback',
    response_type: 'code', scope: 'profile photos.read', state,
    code_challenge: challengeOf(randomBytes(32)),
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
    const stops = await tabStops(page)
    assert.deepEqual(stops, ['decision', 'decision', 'My applications'])
    await page.goto(question('keys'))
    await page.keyboard.press('Tab')
    assert.equal(await page.evaluate(() => document.activeElement.textContent), 'Allow')
    await page.keyboard.press('Enter')
    await page.waitForURL(landingAddress + '/**')
  })
})

const native = { token_endpoint_auth_method: 'none', scope: 'profile photos.read' }

for (const [name, address, warning] of [
  ['loopback', 'http://127.0.0.1/back', 'Any program there can say that it is'],
  ['private-use', 'com.example.pocket:/back', 'Another app can say that it is'],
]) {
  test(`consent page warns of ${name} addresses`, async () => {
    const application = await service.register({ ...native, client_name: 'Pocket',
      redirect_uris: [address] })
    await as('alice', async (page) => {
      const asked = new URL(question('s'))
      asked.searchParams.set('client_id', application.client_id)
      asked.searchParams.set('redirect_uri', address)
      await page.goto(asked.href)
      assert.ok((await page.textContent('.fault')).includes(warning))
      await inspect(page, `consent-${name}`)
    })
  })
}

// Of several scripts, with markup; from right to left, with a part that is not;
// without a place to break.
const names = ['Ωmega «Photo» 日本語 & <b>Söhne</b>', '\u05d0\u05dc\u05d1\u05d5\u05dd txt.exe',
  'W'.repeat(63)]

test('names of any script and length stay in their place', async () => {
  for (const name of names) {
    const metadata = { client_name: name, scope: 'profile photos.read',
      redirect_uris: [`https://${'long-'.repeat(30)}.example/${'path/'.repeat(60)}`] }
    const application = await service.register(metadata)
    await as('alice', async (page) => {
      const asked = new URL(question('s'))
      asked.searchParams.set('client_id', application.client_id)
      asked.searchParams.set('redirect_uri', metadata.redirect_uris[0])
      await page.goto(asked.href)
      await inspect(page, `consent-name-${names.indexOf(name) + 1}`)
    })
    await as('admin', async (page) => {
      await page.goto(`${service.issuer}/admin?view=application&client=${application.client_id}`)
      await inspect(page, `application-name-${names.indexOf(name) + 1}`)
    })
  }
})

test('an unknown application gets a page, not a redirect', async () => {
  await as('alice', async (page) => {
    await page.goto(question('s').replace(/client_id=[^&]+/, 'client_id=unknown'))
    assert.ok(page.url().startsWith(service.issuer))
    assert.ok((await page.textContent('main')).includes('not known'))
    await inspect(page, 'refused')
    await page.goto(service.issuer + '/accounts')
    assert.ok((await page.textContent('main')).includes('no such page'))
    await page.getByRole('link', { name: 'Back' }).click()
    assert.equal(await page.textContent('h1'), 'My applications')
  })
})

test('an administrator registers, disables, enables, and removes, without JavaScript', async () => {
  await as('admin', async (page) => {
    await page.goto(service.issuer + '/admin')
    await page.getByRole('link', { name: 'Register an application' }).click()
    await page.getByLabel('Name', { exact: true }).fill("Anna's <b>Reader</b>")
    await page.getByLabel('Redirect addresses').fill('https://reader.example/cb')
    await page.getByLabel('See and download your files').check()
    await page.getByRole('button', { name: 'Register' }).click()
    const secret = await page.textContent('.secret')
    assert.match(secret, /^[0-9a-f]{64}$/)
    await page.reload()
    assert.equal(await page.textContent('.secret'), secret)
    await page.getByRole('link', { name: 'All applications' }).click()
    await page.getByLabel('Search').fill('anna')
    await page.getByRole('button', { name: 'Search' }).click()
    await page.getByRole('link', { name: "Anna's <b>Reader</b>" }).click()
    assert.equal(await page.locator('.secret').count(), 0)
    await page.getByRole('button', { name: 'Disable' }).click()
    assert.ok((await page.textContent('.notice')).includes('disabled'))
    await page.getByText('nobody gets in').waitFor()
    await page.getByRole('button', { name: 'Enable' }).click()
    assert.ok((await page.textContent('.notice')).includes('enabled'))
    await page.getByText('Renew the secret…').click()
    await page.getByRole('button', { name: 'Renew the secret' }).click()
    assert.notEqual(await page.textContent('.secret'), secret)
    await page.getByText('Remove…').click()
    await page.getByRole('button', { name: 'Remove for good' }).click()
    assert.ok((await page.textContent('.notice')).includes('removed'))
    assert.equal(await page.getByText("Anna's <b>Reader</b>").count(), 0)
  }, { javaScriptEnabled: false })
})

test('what is done once is done once, by two clicks as well', async () => {
  await as('admin', async (page) => {
    await page.goto(service.issuer + '/admin?view=register')
    await page.getByLabel('Name', { exact: true }).fill('Double Click')
    await page.getByLabel('Redirect addresses').fill('https://double.example/cb')
    await page.getByRole('button', { name: 'Register' }).dblclick()
    await page.locator('.secret').waitFor()
    await page.goto(service.issuer + '/admin?contains=double+click')
    assert.equal(await page.getByRole('link', { name: 'Double Click' }).count(), 1)
  })
})

function register(name) {
  return service.register({ client_name: name, scope: 'profile photos.read',
    redirect_uris: [landingAddress + '/callback'] })
}

/// A login of the user with the application: they allow it, it fetches its tokens.
async function logIn(user, application) {
  const verifier = randomBytes(32).toString('hex')
  await as(user, async (page) => {
    const asked = new URL(question('s'))
    asked.searchParams.set('client_id', application.client_id)
    asked.searchParams.set('prompt', 'consent')
    asked.searchParams.set('code_challenge', challengeOf(verifier))
    await page.goto(asked.href)
    await page.getByRole('button', { name: 'Allow' }).click()
    await page.waitForURL(landingAddress + '/**')
  })
  const { searchParams } = arrived.filter((url) => url.pathname === '/callback').at(-1)
  const answer = await fetch(service.issuer + '/oauth/token', {
    method: 'POST',
    body: new URLSearchParams({ grant_type: 'authorization_code', code: searchParams.get('code'),
      redirect_uri: landingAddress + '/callback', code_verifier: verifier,
      client_id: application.client_id, client_secret: application.client_secret }) })
  assert.equal(answer.status, 200)
}

test('a user sees their applications, and takes one back', async () => {
  const made = []
  for (const name of ['Holiday Photos', 'Kitchen Radio', names[0], names[2]]) {
    made.push(await register(name))
    await logIn('bob', made.at(-1))
  }
  await logIn('bob', made[0])
  await as('bob', async (page) => {
    await page.goto(new URL('/', service.issuer).href)
    assert.equal(await page.textContent('h1'), 'My applications')
    const card = page.getByRole('listitem').filter({ hasText: 'Kitchen Radio' })
    assert.ok((await card.textContent()).includes('See your photo albums'))
    await page.locator('summary').first().click()
    await inspect(page, 'account')
    const stops = await tabStops(page)
    assert.deepEqual(stops.slice(0, 2), ['Skip to the content', 'My applications'])
    await card.getByRole('button', { name: /Take back/ }).click()
    assert.ok((await page.textContent('.notice')).includes('taken back'))
    assert.equal(await card.count(), 0)
    await page.getByText('Take back everything…').click()
    await page.getByRole('button', { name: 'Take back everything' }).click()
    await page.getByText('No application has access').waitFor()
    await inspect(page, 'account-empty')
  })
})

test('an administrator revokes the access of a user', async () => {
  await as('admin', async (page) => {
    await page.goto(service.issuer + '/admin')
    await page.getByRole('link', { name: 'Access' }).click()
    await page.getByRole('link', { name: 'alice' }).first().click()
    const revoke = page.getByRole('button', { name: /Revoke/ })
    const count = await revoke.count()
    assert.ok(count > 0)
    await inspect(page, 'access')
    await revoke.first().click()
    assert.ok((await page.textContent('.notice')).includes('revoked'))
    assert.equal(await revoke.count(), count - 1)
  })
})

/// Has the service ask for passwords itself while `work` is done.
async function withPeople(people, work) {
  const folder = process.env.SERVICE_RUN
  const path = folder + '/settings.json'
  const before = readFileSync(path)
  const file = folder + '/people'
  for (const [name, password] of Object.entries(people)) {
    execFileSync(process.env.SERVICE_PROGRAMS + '/keldoauth-service',
      ['user', 'add', '--file', file, name], { input: password + '\n' })
  }
  writeFileSync(path, JSON.stringify({ ...JSON.parse(before), sign_in: 'htpasswd',
    htpasswd_file: file, counters_file: folder + '/counters' }))
  try {
    await work()
  } finally {
    writeFileSync(path, before)
  }
}

async function signIn(page, name, password) {
  await page.getByLabel('User name').fill(name)
  await page.getByLabel('Password').fill(password)
  await page.getByRole('button', { name: 'Sign in' }).click()
}

test('people sign in, become somebody else, and sign out by pages', async () => {
  await withPeople({ alice: 'of alice', carol: 'of carol' }, () => as('alice', async (page) => {
    await page.goto(question('pages'))
    await inspect(page, 'sign-in')
    await signIn(page, 'alice', 'wrong')
    assert.ok((await page.textContent('main')).includes('wrong'))
    await inspect(page, 'sign-in-wrong')
    await signIn(page, 'alice', 'of alice')
    assert.ok((await page.textContent('.eyebrow')).includes('alice'))
    await inspect(page, 'consent-session')
    assert.deepEqual(await tabStops(page),
      ['Sign in as somebody else', 'decision', 'decision', 'My applications'])
    await page.getByRole('link', { name: 'Sign in as somebody else' }).click()
    await signIn(page, 'carol', 'of carol')
    assert.ok((await page.textContent('.eyebrow')).includes('carol'))
    await page.getByRole('button', { name: 'Allow' }).click()
    await page.waitForURL(landingAddress + '/**')
    await page.goto(service.issuer + '/account')
    await page.getByRole('heading', { name: 'Holiday Photos' }).waitFor()
    await inspect(page, 'account-session')
    await page.getByRole('button', { name: 'Sign out' }).click()
    await page.getByText('You are signed out').waitFor()
    await inspect(page, 'signed-out')
    await page.goto(service.issuer + '/account')
    await page.getByLabel('User name').waitFor()
  }))
})

test('every page of the administrator looks right', async () => {
  await service.register({ client_name: 'Kitchen Radio', scope: 'profile' })
  await as('admin', async (page) => {
    for (const [name, path] of [['applications', '/admin'], ['users', '/admin?view=access'],
      ['log', '/admin?view=log'], ['storage', '/admin?view=storage'],
      ['register', '/admin?view=register']]) {
      await page.goto(service.issuer + path)
      await inspect(page, name)
    }
    await page.getByText('More').click()
    await page.getByLabel('Name', { exact: true }).fill('Printer')
    await page.getByLabel('Redirect addresses').fill('http://printer.example/')
    await page.getByRole('button', { name: 'Register' }).click()
    assert.equal(await page.getByLabel('Name', { exact: true }).inputValue(), 'Printer')
    await inspect(page, 'fault')
    await page.getByLabel('Redirect addresses').fill('https://printer.example/')
    await page.getByRole('button', { name: 'Register' }).click()
    await page.locator('.secret').waitFor()
    for (const summary of await page.locator('summary').all()) await summary.click()
    await inspect(page, 'application')
    const stops = await tabStops(page)
    assert.deepEqual(stops.slice(0, 6), ['Skip to the content', 'My applications', 'Applications',
      'Access', 'Audit log', 'Storage'])
    assert.ok(stops.indexOf('name') < stops.indexOf('redirect'))
  })
})

test('a thousand applications and ten thousand logins are fifty on a page', async () => {
  await logIn('alice', await register('Crowd'))
  execFileSync('/usr/bin/python3', [new URL('../crowd.py', import.meta.url).pathname])
  await as('admin', async (page) => {
    await page.goto(service.issuer + '/admin')
    assert.equal(await page.locator('.cards > li').count(), 50)
    assert.ok((await page.textContent('main')).includes('1 to 50 of 1000 applications'))
    await page.getByRole('link', { name: 'Last' }).click()
    assert.ok((await page.textContent('main')).includes('951 to 1000 of 1000 applications'))
    await inspect(page, 'applications-last')
    await page.goto(service.issuer + '/admin?view=access')
    assert.equal(await page.locator('tbody > tr').count(), 50)
    assert.match(await page.textContent('main'), /1 to 50 of 100\d\d grants of access/)
    await page.getByRole('link', { name: 'Next' }).click()
    await inspect(page, 'access-second')
    await page.goto(service.issuer + '/admin?view=storage')
    assert.ok((await page.textContent('main')).includes('Full'))
    await inspect(page, 'storage-full')
  })
})
