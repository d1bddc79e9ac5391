{{%AUTOESCAPE context="HTML"}}
<!DOCTYPE html>
<html lang="en">
<head>
{{>HEAD}}
<title>Log in to continue to {{CLIENT}}</title>
</head>
<body>
<main>
<h1>Log in</h1>
<p>to continue to <strong>{{CLIENT}}</strong>. Your password stays here: {{CLIENT}} does not get it.</p>
<form method="post" action="/authorize">
{{#FIELD}}
<input type="hidden" name="{{NAME}}" value="{{VALUE}}">
{{/FIELD}}
<input type="hidden" name="csrf" value="{{FORM_TOKEN}}">
{{#FAILED}}
<p class="error" id="problem" role="alert">Name or password is wrong.</p>
{{/FAILED}}
<label for="username">Name</label>
<input id="username" name="username" value="{{USER}}" required maxlength="256" autocomplete="username" autocapitalize="none" spellcheck="false"{{#MARKED}} aria-invalid="true" aria-describedby="problem"{{/MARKED}}>
<label for="password">Password</label>
<input id="password" name="password" type="password" required maxlength="1024" autocomplete="current-password"{{#MARKED}} aria-invalid="true" aria-describedby="problem"{{/MARKED}}>
<div class="choices">
<button type="submit" name="action" value="login">Log in</button>
</div>
</form>
</main>
</body>
</html>
