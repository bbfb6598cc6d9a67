import { Button } from '@patternfly/react-core/dist/esm/components/Button';
import { FormGroup, FormHelperText } from '@patternfly/react-core/dist/esm/components/Form';
import { HelperText, HelperTextItem } from '@patternfly/react-core/dist/esm/components/HelperText';
import { InputGroup, InputGroupItem } from '@patternfly/react-core/dist/esm/components/InputGroup';
import { TextInput } from '@patternfly/react-core/dist/esm/components/TextInput';
import EyeIcon from '@patternfly/react-icons/dist/esm/icons/eye-icon';
import EyeSlashIcon from '@patternfly/react-icons/dist/esm/icons/eye-slash-icon';
import { useState, type KeyboardEvent } from 'react';
import { t } from '../texts';
import { useSettled } from './useSettled';

interface TextFieldProps {
  id: string;
  label: string;
  value: string;
  onChange: (value: string) => void;
  // What is wrong with the value, or null. Shown after a pause in typing, when the field is left, or at once when
  // `insist` is set.
  problem?: string | null;
  insist?: boolean;
  hint?: string;
  required?: boolean;
  disabled?: boolean;
  // The browser's hint for what to fill in, such as "username".
  autoComplete?: string;
  password?: boolean;
  initialFocus?: boolean;
  // For names, addresses and the like: no corrections and no capitals.
  verbatim?: boolean;
}

// A field with its label, a hint, and what is wrong with it.
export function TextField(props: TextFieldProps) {
  const { id, label, value, onChange, problem = null, insist = false, hint, required = false } = props;
  const {
    disabled = false,
    autoComplete = 'off',
    password = false,
    initialFocus = false,
    verbatim = true,
  } = props;
  const settled = useSettled(value);
  const [left, setLeft] = useState(false);
  const [shown, setShown] = useState(false);
  const [capsLock, setCapsLock] = useState(false);

  const complaint = problem !== null && (insist || settled || left) ? problem : null;
  const helper = `${id}-helper`;
  const watchCapsLock = (event: KeyboardEvent) => setCapsLock(event.getModifierState('CapsLock'));
  const input = (
    <TextInput
      id={id}
      name={id}
      type={password && !shown ? 'password' : 'text'}
      value={value}
      onChange={(_event, next) => {
        setLeft(false);
        onChange(next);
      }}
      onBlur={() => {
        setLeft(value !== '');
        setCapsLock(false);
      }}
      isRequired={required}
      isDisabled={disabled}
      validated={complaint === null ? 'default' : 'error'}
      autoComplete={autoComplete}
      aria-describedby={helper}
      // eslint-disable-next-line jsx-a11y/no-autofocus -- the first field of a dialog or of the log-in
      autoFocus={initialFocus}
      {...(verbatim ? { spellCheck: false, autoCapitalize: 'none', autoCorrect: 'off' } : {})}
      {...(password ? { onKeyDown: watchCapsLock, onKeyUp: watchCapsLock } : {})}
    />
  );

  return (
    <FormGroup label={label} fieldId={id} isRequired={required}>
      {password ? (
        <InputGroup>
          <InputGroupItem isFill>{input}</InputGroupItem>
          <InputGroupItem>
            <Button
              variant="control"
              aria-label={t(shown ? 'common.hide' : 'common.show')}
              aria-controls={id}
              icon={shown ? <EyeSlashIcon /> : <EyeIcon />}
              isDisabled={disabled}
              onClick={() => setShown(!shown)}
            />
          </InputGroupItem>
        </InputGroup>
      ) : (
        input
      )}
      <FormHelperText id={helper} aria-live="polite">
        <HelperText>
          {capsLock && <HelperTextItem variant="warning">{t('login.capsLock')}</HelperTextItem>}
          {complaint !== null && <HelperTextItem variant="error">{complaint}</HelperTextItem>}
          {complaint === null && hint !== undefined && <HelperTextItem>{hint}</HelperTextItem>}
        </HelperText>
      </FormHelperText>
    </FormGroup>
  );
}
