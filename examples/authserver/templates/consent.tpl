{{%AUTOESCAPE context="HTML"}}
<!DOCTYPE html>
<html lang="en">
<head>
{{>HEAD}}
<title>Allow {{CLIENT}}?</title>
</head>
<body>
<main>
<form method="post" action="/authorize">
{{#FIELD}}
<input type="hidden" name="{{NAME}}" value="{{VALUE}}">
{{/FIELD}}
<input type="hidden" name="csrf" value="{{FORM_TOKEN}}">
<h1>Allow {{CLIENT}}?</h1>
<p>You are logged in as <strong>{{USER}}</strong>. <button type="submit" name="action" value="switch" class="link">Not you? Use another account</button></p>
<h2 id="wishes"><strong>{{CLIENT}}</strong> asks to</h2>
<ul aria-labelledby="wishes">
{{#WISH}}
<li>{{WORDS}}</li>
{{/WISH}}
</ul>
<p>Either way you go back to <strong>{{DESTINATION}}</strong>.</p>
<div class="choices">
<button type="submit" name="action" value="allow">Allow</button>
<button type="submit" name="action" value="deny" class="second">Deny</button>
</div>
</form>
</main>
</body>
</html>
