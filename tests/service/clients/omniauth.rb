# A web application that lets people in with omniauth_openid_connect, unchanged:
# /auth/box starts, and where it ends, it says who came. Without a server: each
# line of input is the path of a request, and each line of output its answer.

require 'json'
require 'rack'
require 'omniauth_openid_connect'

# The libraries look for the issuer by https, if they are not told otherwise.
SWD.url_builder = URI::HTTP
OmniAuth.config.allowed_request_methods = %i[get]
OmniAuth.config.silence_get_warning = true
OmniAuth.config.logger = Logger.new($stderr)

home, id, secret, method = ARGV
application = Rack::Builder.app do
  use Rack::Session::Cookie, secret: 'x' * 64
  use OmniAuth::Builder do
    provider :openid_connect,
             name: :box, issuer: ENV.fetch('SERVICE_ISSUER'), discovery: true,
             scope: %i[openid profile email], client_auth_method: method&.to_sym,
             client_options: { identifier: id, secret: secret,
                               redirect_uri: "#{home}/auth/box/callback" }
  end
  run(lambda do |request|
    came = request['omniauth.auth']
    [200, {}, [came ? JSON.generate(came) : request['PATH_INFO']]]
  end)
end

visitor = Rack::MockRequest.new(application)
cookie = ''
$stdout.sync = true
$stdin.each_line(chomp: true) do |path|
  answer = visitor.get(home + path, 'HTTP_COOKIE' => cookie)
  cookie = answer['Set-Cookie'].split(';').first if answer['Set-Cookie']
  puts JSON.generate([answer.status, answer['Location'], answer.body])
end
